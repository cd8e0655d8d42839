#include <optional>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Rows.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {
namespace {

struct ListOptions {
    InstrumentOptions instrument;
    bool candidates = false;
    bool chipId = false;
    bool json = false;
};

void List(Session& session, const ListOptions& options) {
    if (options.candidates) {
        PrintCandidates(session, options.json);
        return;
    }
    session.ChooseTransport(options.instrument.transport);
    const bool isUsbIo = session.Context().UsedTransport() == Service::Context::Transport::UsbIo;
    const std::vector<std::string> connected = ListInstruments(session.Context());
    Rows instruments({{"", "identifier", Table::Align::Left, false},
                      {"NAME", "name"},
                      {"IDENTIFIER"},
                      {options.chipId ? "CHIP ID" : "", "chipId"},
                      {"", "problem", Table::Align::Left, false}});
    std::optional<Failure> failure;  // one that is used by others is none
    for (const std::string& identifier : connected) {
        Rows::Cell chipId("", std::nullopt);
        Rows::Cell problem("", std::nullopt);
        if (options.chipId) {
            const Service::ChipIdAnswer answer = AskChipId(session.Context(), identifier);
            chipId = answer.problem ? Rows::Cell("(not asked)", Json()) : Rows::Cell(answer.chipId);
            if (answer.problem) {
                problem = answer.problem->what();
                session.Warn(problem.text);
                if (ExitCodeOf(answer.problem->Kind()) != ExitCode::NotAvailable && !failure) {
                    failure = answer.problem;
                }
            }
        }
        instruments.Add({identifier, Service::ShortNameOf(identifier), identifier, chipId, problem});
    }
    if (options.json) {
        session.Print({{"transport", isUsbIo ? "usbio" : "native"}, {"instruments", instruments.AsJson()}});
    } else if (!connected.empty()) {
        instruments.Print(session.Out());
    }
    Service::FindInstrument(connected, {});  // says what to do when there is none
    if (failure) {
        throw Failure(failure->Kind(), "not every instrument has told its chip id", failure->Advice());
    }
}

}  // namespace

void AddList(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "list", "list the instruments that are connected", List);
    AddTransportOption(command, options.instrument);
    command.AddFlag("--candidates", options.candidates,
                    "show the USB devices that could be instruments instead, registered or not");
    command
        .AddFlag("--chip-id", options.chipId,
                 "show the chip ids as well: opens (and thereby resets) the instruments that are free")
        .Excludes("--candidates");
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
