#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Service/EventWatch.h"

namespace Varnholt::Cli {
namespace {

struct MonitorOptions : InstrumentOptions {
    double seconds = 0;
};

constexpr std::uint32_t LookInterval = 20;  // milliseconds

const char* NameOf(Service::EventKind kind) {
    static constexpr const char* names[] = {"button", "removed", "unknown"};
    return names[static_cast<std::size_t>(kind)];
}

void Print(Session& session, const Service::InstrumentEvent& event, bool asJson) {
    session.Print(asJson, {{"seconds", event.seconds}, {"event", NameOf(event.kind)}, {"code", event.code}},
                  fmt::format("{:9.3f} s  {}\n", event.seconds, NameOf(event.kind)));
    session.FlushOut();
}

void Monitor(Session& session, const MonitorOptions& options) {
    Service::EventMailbox mailbox;
    Service::OpenedInstrument instrument(session.Context(), ChooseInstrument(session, options), &mailbox);
    Service::EventReader events(mailbox, instrument);
    session.Note("watching " + instrument.Identifier() + "; Ctrl-C ends");
    for (;;) {
        while (const auto event = events.Next()) {
            Print(session, *event, options.json);
            if (event->kind == Service::EventKind::Removed) {
                return;
            }
        }
        const bool isOver = options.seconds > 0 && events.Seconds() >= options.seconds;
        if (isOver || !session.UserInterruption().Sleep(LookInterval)) {
            return;
        }
    }
}

}  // namespace

void AddMonitor(CommandSpec app, Session& session) {
    auto [command, options] = NewCommand(
        app, session, "monitor",
        "print a line each time that the button is pressed, and when the instrument is removed", Monitor);
    command.Add("--for", options.seconds, "end after this many seconds (default: with Ctrl-C)",
                {.type = "SECONDS", .between = {{0.001, 1e6}}});
    AddCommonOptions(command, options);
}

}  // namespace Varnholt::Cli
