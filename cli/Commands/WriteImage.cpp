#include <fmt/format.h>

#include <span>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Memory/EepromFile.h"
#include "Output/Json.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    InstrumentOptions instrument;
    std::string file;
    bool json = false;
};

void WriteImage(Session& session, const Options& options) {
    const EepromImage image = ReadImageFile(options.file);
    Instrument instrument(session, options.instrument, Instrument::Choice::MustBeNamed);
    const Interruption::Deferral deferral(session.UserInterruption());
    constexpr std::uint32_t pieces = Protocol::EepromSize / Protocol::EepromWritePiece;
    std::uint32_t written = 0;
    try {
        Progress progress = session.MakeProgress("writing", pieces, "pieces");
        for (; written < pieces; ++written) {
            session.UserInterruption().ThrowIfRequested();
            const std::uint32_t address = written * Protocol::EepromWritePiece;
            const auto piece = std::span(image).subspan(address, Protocol::EepromWritePiece);
            instrument.Commands().WriteEEPROM(address, {piece.begin(), piece.end()});
            progress.Update(written + 1);
        }
    } catch (...) {
        const FailureReport report = session.Explain(std::current_exception());
        throw ToolFailure(
            report.code, fmt::format("{}; {} of {} pieces were written", report.message, written, pieces),
            written == 0 ? report.advice
                         : "the EEPROM is neither the old nor the new one: write an image again");
    }
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()}, {"file", options.file}, {"pieces", pieces}});
    } else {
        session.Out() << options.file << " written to " << instrument.Identifier() << " in " << pieces
                      << " pieces\n";
    }
}

}  // namespace

void AddWriteImage(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = app.AddCommand("write-image",
                                         "write an EEPROM image as it is, unchecked, as the library "
                                         "does (`ostra eeprom write` is the safe way)");
    command.Add("FILE", options->file, "image of 8192 bytes").Required();
    AddInstrumentOptions(command, options->instrument);
    AddJsonFlag(command, options->json);
    SetAction(command, session, options, WriteImage);
}

}  // namespace Varnholt::Cli
