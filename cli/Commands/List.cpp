#include <optional>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Table.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    InstrumentOptions instrument;
    bool candidates = false;
    bool chipId = false;
    bool json = false;
};

void List(Session& session, const Options& options) {
    if (options.candidates) {
        PrintCandidates(session, options.json);
        return;
    }
    session.ChooseTransport(options.instrument.transport);
    const bool isUsbIo = session.Context().UsedTransport() == Service::Context::Transport::UsbIo;
    const std::vector<std::string> connected = ListInstruments(session.Context());
    Json instruments = Json::array();
    Table table({{"NAME"}, {"IDENTIFIER"}, {options.chipId ? "CHIP ID" : ""}});
    std::optional<Failure> failure;  // one that is used by others is none
    for (const std::string& identifier : connected) {
        Json instrument{{"identifier", identifier}, {"name", Service::ShortNameOf(identifier)}};
        std::string chipId;
        if (options.chipId) {
            const Service::ChipIdAnswer answer = AskChipId(session.Context(), identifier);
            chipId = answer.chipId;
            instrument["chipId"] = chipId.empty() ? Json(nullptr) : Json(chipId);
            if (answer.problem) {
                chipId = "(not asked)";
                instrument["problem"] = answer.problem->what();
                session.Warn(answer.problem->what());
                if (ExitCodeOf(answer.problem->Kind()) != ExitCode::NotAvailable && !failure) {
                    failure = answer.problem;
                }
            }
        }
        instruments.push_back(instrument);
        table.AddRow({Service::ShortNameOf(identifier), identifier, chipId});
    }
    if (options.json) {
        session.Print({{"transport", isUsbIo ? "usbio" : "native"}, {"instruments", instruments}});
    } else if (!connected.empty()) {
        table.Print(session.Out());
    }
    Service::FindInstrument(connected, {});  // says what to do when there is none
    if (failure) {
        throw Failure(failure->Kind(), "not every instrument has told its chip id", failure->Advice());
    }
}

}  // namespace

void AddList(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = app.AddCommand("list", "list the instruments that are connected");
    AddTransportOption(command, options->instrument);
    command.AddFlag("--candidates", options->candidates,
                    "show the USB devices that could be instruments instead, registered or not");
    command
        .AddFlag("--chip-id", options->chipId,
                 "show the chip ids as well: opens (and thereby resets) the instruments that are free")
        .Excludes("--candidates");
    AddJsonFlag(command, options->json);
    SetAction(command, session, options, List);
}

}  // namespace Varnholt::Cli
