#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Memory/InputFile.h"
#include "Output/Json.h"
#include "Protocol/Instrument.h"
#include "Service/Memory/EepromAccess.h"

namespace Varnholt::Cli {
namespace {

struct WriteImageOptions {
    InstrumentOptions instrument;
    std::string file;
    bool json = false;
};

void WriteImage(Session& session, const WriteImageOptions& options) {
    const Service::EepromImage image = ReadImageFile(session, options.file);
    Service::OpenedInstrument instrument(session.Context(),
                                         ChooseInstrument(session, options.instrument, Choice::MustBeNamed));
    std::vector<Service::WritePiece> pieces;
    for (std::uint32_t at = 0; at < Protocol::EepromSize; at += Protocol::EepromWritePiece) {
        pieces.push_back({at, Protocol::EepromWritePiece});
    }
    WriteEeprom(instrument, image, pieces,
                "the EEPROM may be neither the old nor the new one: write an image again");
    if (options.json) {
        session.Print(
            {{"identifier", instrument.Identifier()}, {"file", options.file}, {"pieces", pieces.size()}});
    } else {
        session.Out() << ShownSource(options.file) << " written to " << instrument.Identifier() << " in "
                      << pieces.size() << " pieces\n";
    }
}

}  // namespace

void AddWriteImage(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "write-image",
                   "write the whole of an EEPROM image, whatever is in it, as the "
                   "library does, and read it back (`ostra eeprom write` is the safe way)",
                   WriteImage);
    command.Add("--image,FILE", options.file, "image of 8192 bytes; `-` is standard input")
        .Type("FILE")
        .Required();
    AddInstrumentOptions(command, options.instrument);
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
