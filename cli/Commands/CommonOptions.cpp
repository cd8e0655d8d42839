#include "Commands/CommonOptions.h"

namespace Varnholt::Cli {
namespace {
constexpr const char* Heading = "Instrument";
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
