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

void AddInstrumentOptions(CommandSpec command, InstrumentOptions& options) {
    command
        .Add("-d,--device", options.device,
             "instrument: its identifier or the end of it, as `ostra list` shows, or chip:ID (default: the "
             "first)")
        .Type("NAME")
        .Group(Heading);
    AddTransportOption(command, options);
}

void AddTransportOption(CommandSpec command, InstrumentOptions& options) {
    command
        .Add("--transport", options.transport,
             "the way to the instrument: native or usbio (default: what this machine prefers)")
        .OneOf({"native", "usbio"})
        .Type("WAY")
        .Group(Heading);
}

void AddJsonFlag(CommandSpec command, bool& json) {
    command.AddFlag("--json", json, "print JSON").Group("Output");
}

}  // namespace Varnholt::Cli
