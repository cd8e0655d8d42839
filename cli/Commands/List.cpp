#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Rows.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {
namespace {

struct ListOptions : InstrumentOptions {
    bool candidates = false;
    bool chipId = false;
};

void List(Session& session, const ListOptions& options) {
    if (options.candidates) {
        PrintCandidates(session, options.json);
        return;
    }
    session.ChooseTransport(options.transport);
    const bool isUsbIo = session.Context().UsedTransport() == Service::Context::Transport::UsbIo;
    const std::vector<std::string> connected = ListInstruments(session.Context());
    Rows instruments({{"", "identifier", Rows::Hidden},
                      {"NAME", "name"},
                      {"IDENTIFIER"},
                      {options.chipId ? "CHIP ID" : "", "chipId"},
                      {"", "problem", Rows::Hidden}});
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
    session.Print(options.json,
                  {{"transport", isUsbIo ? "usbio" : "native"}, {"instruments", instruments.AsJson()}},
                  connected.empty() ? "" : instruments.Text());
    Service::FindInstrument(connected, {});  // says what to do when there is none
    if (failure) {
        throw Failure(failure->Kind(), "not every instrument has told its chip id", failure->Advice());
    }
}

}  // namespace

void AddList(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "list", "list the instruments that are connected", List);
    AddTransportOption(command, options);
    command.Add("--candidates", options.candidates,
                "show the USB devices that could be instruments instead, registered or not");
    command.Add("--chip-id", options.chipId,
                "show the chip ids as well: opens (and thereby resets) the instruments that are free",
                {.excludes = {"--candidates"}});
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
