#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Memory/InputFile.h"
#include "Output/Json.h"
#include "Protocol/Instrument.h"
#include "Service/Memory/EepromAccess.h"

namespace Varnholt::Cli {
namespace {

struct WriteImageOptions : InstrumentOptions {
    std::string file;
};

void WriteImage(Session& session, const WriteImageOptions& options) {
    const Service::EepromImage image = ReadImageFile(session, options.file);
    auto instrument = OpenInstrument(session, options, Choice::MustBeNamed);
    std::vector<Service::WritePiece> pieces;
    for (std::uint32_t at = 0; at < Protocol::EepromSize; at += Protocol::EepromWritePiece) {
        pieces.push_back({at, Protocol::EepromWritePiece});
    }
    WriteEeprom(instrument, image, pieces,
                "the EEPROM may be neither the old nor the new one: write an image again");
    session.Print(
        options.json,
        {{"identifier", instrument.Identifier()}, {"file", options.file}, {"pieces", pieces.size()}},
        fmt::format("{} written to {} in {} pieces\n", ShownSource(options.file), instrument.Identifier(),
                    pieces.size()));
}

}  // namespace

void AddWriteImage(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "write-image",
                   "write the whole of an EEPROM image, whatever is in it, as the "
                   "library does, and read it back (`ostra eeprom write` is the safe way)",
                   WriteImage);
    AddImageArgument(command, options.file);
    AddCommonOptions(command, options);
}

}  // namespace Varnholt::Cli
