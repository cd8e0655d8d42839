#include "Commands/CommonOptions.h"

#include <fmt/format.h>

namespace Varnholt::Cli {
namespace {
constexpr const char* Heading = "Instrument";
}

Service::FoundInstrument ChooseInstrument(Session& session, const InstrumentOptions& options, Choice choice) {
    session.ChooseTransport(options.transport);
    Service::FoundInstrument found = FindInstrument(session.Context(), options.device);
    if (options.device.empty() && found.connected.size() > 1) {
        if (choice == Choice::MustBeNamed) {
            throw Failure(FailureKind::BadArgument, "several instruments are connected",
                          fmt::format("say which one with --device: {}", fmt::join(found.connected, ", ")));
        }
        session.Note(fmt::format("taking {}, the first of {} (--device names another)", found.Identifier(),
                                 found.connected.size()));
    }
    return found;
}

Service::OpenedInstrument OpenInstrument(Session& session, const InstrumentOptions& options, Choice choice) {
    return {session.Context(), ChooseInstrument(session, options, choice)};
}

void AddTransportOption(CommandSpec command, InstrumentOptions& options) {
    command.Under(Heading).Add(
        "--transport", options.transport,
        "the way to the instrument: native or usbio (default: what this machine prefers)",
        {.type = "WAY", .oneOf = {"native", "usbio"}});
}

void AddInstrumentOptions(CommandSpec command, InstrumentOptions& options) {
    command.Under(Heading).Add("-d,--device", options.device,
                               "instrument: its identifier or the end of it, as `ostra list` shows, or "
                               "chip:ID (default: the first)",
                               {.type = "NAME"});
    AddTransportOption(command, options);
}

void AddJsonFlag(CommandSpec command, bool& json) {
    command.Under("Output").Add("--json", json, "print JSON");
}

void AddCommonOptions(CommandSpec command, InstrumentOptions& options) {
    AddInstrumentOptions(command, options);
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
