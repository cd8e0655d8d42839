#include <optional>

#include "ChipId.h"
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
    const bool isUsbIo = session.UsedTransport() == DeviceDriver::Ostra::Transport::UsbIo;
    const std::vector<std::string> connected = ConnectedInstruments(session.UsedTransport());
    Json instruments = Json::array();
    Table table({{"NAME"}, {"IDENTIFIER"}, {options.chipId ? "CHIP ID" : ""}});
    std::optional<FailureReport> failure;  // one that is used by others is none
    for (const std::string& identifier : connected) {
        Json instrument{{"identifier", identifier}, {"name", ShortNameOf(identifier)}};
        std::string chipId;
        if (options.chipId) {
            const ChipIdAnswer answer = AskChipId(session, identifier, options.instrument.transport);
            const FailureReport& problem = answer.problem;
            chipId = answer.chipId;
            instrument["chipId"] = chipId.empty() ? Json(nullptr) : Json(chipId);
            if (chipId.empty()) {
                chipId = "(not asked)";
                instrument["problem"] = problem.message;
                session.Warn(problem.message);
                if (problem.code != ExitCode::NotAvailable && !failure) {
                    failure = problem;
                }
            }
        }
        instruments.push_back(instrument);
        table.AddRow({ShortNameOf(identifier), identifier, chipId});
    }
    if (options.json) {
        session.Print({{"transport", isUsbIo ? "usbio" : "native"}, {"instruments", instruments}});
    } else if (!connected.empty()) {
        table.Print(session.Out());
    }
    FindInstrument(connected, {});  // says what to do when there is none
    if (failure) {
        throw ToolFailure(failure->code, "not every instrument has told its chip id", failure->advice);
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
