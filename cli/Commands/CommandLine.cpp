#include "Commands/CommandLine.h"

namespace Varnholt::Cli {
namespace {
constexpr const char* Group = "Instrument";
}

void AddInstrumentOptions(CLI::App* command, InstrumentOptions& options) {
    command
        ->add_option(
            "-d,--device", options.device,
            "instrument: its identifier or the end of it, as `ostra list` shows (default: the first)")
        ->type_name("NAME")
        ->group(Group);
    AddTransportOption(command, options);
}

void AddTransportOption(CLI::App* command, InstrumentOptions& options) {
    command
        ->add_option("--transport", options.transport,
                     "the way to the instrument: native or usbio (default: what this machine prefers)")
        ->check(Silent(CLI::IsMember({"native", "usbio"})))
        ->type_name("WAY")
        ->group(Group);
}

void AddJsonFlag(CLI::App* command, bool& json) {
    command->add_flag("--json", json, "print JSON")->group("Output");
}

}  // namespace Varnholt::Cli
