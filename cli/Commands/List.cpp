#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Table.h"
#include "SystemCommands.h"
#include "Utilities/Tools/Win32/SystemHelperWin.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    InstrumentOptions instrument;
    bool candidates = false;
    bool json = false;
};

void List(Session& session, const Options& options) {
    if (options.candidates) {
        PrintCandidates(session, options.json);
        return;
    }
    session.UseTransport(options.instrument.transport);
    const std::string transport = Utilities::Tools::Is64BitOS() ? "usbio" : "native";
    const std::vector<std::string> connected = ConnectedInstruments();
    Json instruments = Json::array();
    Table table({{"NAME"}, {"IDENTIFIER"}});
    for (const std::string& identifier : connected) {
        instruments.push_back({{"identifier", identifier}, {"name", ShortNameOf(identifier)}});
        table.AddRow({ShortNameOf(identifier), identifier});
    }
    if (options.json) {
        session.Print({{"transport", transport}, {"instruments", instruments}});
    } else if (!connected.empty()) {
        table.Print(session.Out());
    }
    FindInstrument(connected, {});  // says what to do when there is none
}

}  // namespace

void AddList(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = app.AddCommand("list", "list the instruments that are connected");
    AddTransportOption(command, options->instrument);
    command.AddFlag("--candidates", options->candidates,
                    "show the USB devices that could be instruments instead, registered or not");
    AddJsonFlag(command, options->json);
    SetAction(command, session, options, List);
}

}  // namespace Varnholt::Cli
