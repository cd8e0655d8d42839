#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Service/EventWatch.h"

namespace Varnholt::Cli {
namespace {

struct MonitorOptions {
    InstrumentOptions instrument;
    double seconds = 0;
    bool json = false;
};

constexpr std::uint32_t LookInterval = 20;  // milliseconds

const char* NameOf(Service::EventKind kind) {
    switch (kind) {
        case Service::EventKind::Button:
            return "button";
        case Service::EventKind::Removed:
            return "removed";
        case Service::EventKind::Unknown:
            break;
    }
    return "unknown";
}

void Print(Session& session, const Service::InstrumentEvent& event, bool asJson) {
    if (asJson) {
        session.Print({{"seconds", event.seconds}, {"event", NameOf(event.kind)}, {"code", event.code}});
    } else {
        session.Out() << fmt::format("{:9.3f} s  {}\n", event.seconds, NameOf(event.kind));
    }
    session.FlushOut();
}

void Monitor(Session& session, const MonitorOptions& options) {
    Service::EventWatch watch(session.Context(), ChooseInstrument(session, options.instrument));
    session.Note("watching " + watch.Identifier() + "; Ctrl-C ends");
    for (;;) {
        while (const auto event = watch.Events().Next()) {
            Print(session, *event, options.json);
            if (event->kind == Service::EventKind::Removed) {
                return;
            }
        }
        const bool isOver = options.seconds > 0 && watch.Events().Seconds() >= options.seconds;
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
    command.Add("--for", options.seconds, "end after this many seconds (default: with Ctrl-C)")
        .Type("SECONDS")
        .Between(0.001, 1e6);
    AddInstrumentOptions(command, options.instrument);
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
