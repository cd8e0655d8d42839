#include "ProgramOptions.h"

#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <CLI/Validators.hpp>
#include <cmath>
#include <cstdlib>
#include <stdexcept>

#include "FaultPlan.h"
#include "Platform/Usb/UsbIpProtocol.h"

namespace Varnholt::Simulator {

namespace Usb = Platform::Usb;

namespace {

constexpr const char* Footer = R"(
A simulated instrument is found by libostra and by the tool ostra like a real one, under the name
simulated-NAME, for as long as this program runs; only programs of the same user can use it.
Ending the program unplugs the instrument. One program at a time can have an instrument open.

Examples:
  ostra-simulator
      one instrument, simulated-1, until Ctrl-C
  ostra-simulator --name lab --eeprom lab.bin
      simulated-lab, whose EEPROM is kept in lab.bin
  ostra-simulator --count 3 --firmware old --light 0.2
      simulated-1 to simulated-3, with the old firmware, under a weak lamp
  ostra-simulator --scan-records 1000 --rate 53e6 --button-after 2000
      scans of 1000 readouts at the speed of USB, and a press of the button
  ostra-simulator --tcp
      and then, as root:  modprobe vhci-hcd; usbip attach -r 127.0.0.1 -b 1-1
      a Linux kernel sees the instrument as if it were plugged in
  ostra-simulator --attach
      the same without the program usbip, on this machine's kernel
  ostra-simulator --faults "bulk-in 0:stall; 7+:silent"
      the first bulk IN transfer stalls, and from transfer 7 on nothing answers

Exit codes: 0 when it was told to end; 2 when it cannot start (an option, a file that cannot be read or, as
that of --eeprom, written, a port that is taken) or what was written to an EEPROM is lost.

Faults are written INDEX:FAULT, several separated by semicolons. INDEX counts the transfers from 0, anew each
time that the instrument is opened; with a + behind it the fault stays from then on. In front of it may
stand which transfers are counted instead of all: control, bulk-in, bulk-out or interrupt. The standard
requests of an operating system are left alone. The faults:
)";

std::string FaultHelp() {
    std::string text;
    for (const FaultName& fault : AllFaults()) {
        text += text.empty() ? "  " : ", ";
        text += fault.name;
        switch (fault.argument) {
            case FaultName::Argument::None:
                break;
            case FaultName::Argument::Optional:
                text += "[=" + std::string(fault.argumentName) + "]";
                break;
            case FaultName::Argument::Required:
                text += "=" + std::string(fault.argumentName);
                break;
        }
    }
    return text + "\n";
}

/// A range lets "nan" pass, which is neither below nor above it.
std::string RefuseNan(const std::string& text) {
    return std::isnan(std::strtod(text.c_str(), nullptr)) ? "\"" + text + "\" is no number" : "";
}

/// It would be taken for a very large number.
std::string RefuseNegative(const std::string& text) {
    return text.starts_with('-') ? text + " is negative" : "";
}

}  // namespace

void DefineOptions(CLI::App& program, ProgramOptions& options) {
    program.description("Simulates the instrument, so that everything runs without hardware.");
    program.footer(Footer + FaultHelp());
    program.set_version_flag("--version", "ostra-simulator " OSTRA_VERSION, "print the version");
    program.add_option("--name", options.names, "the instrument's name; repeated: one instrument for each")
        ->type_name("NAME");
    program
        .add_option("--count", options.count,
                    "that many instruments, named 1, 2, ..., or NAME-1, NAME-2, ...")
        ->check(CLI::Range(1, 100));
    program
        .add_option("--eeprom", options.eepromFiles,
                    "keep the EEPROM in this file; repeated: for one instrument after the other")
        ->type_name("FILE");
    program.add_option("--image", options.imageFile, "begin with this EEPROM image instead of a fresh one")
        ->type_name("FILE");
    program
        .add_option("--firmware", options.firmware, "old: one measurement mode; new: three to choose from")
        ->check(CLI::IsMember({"old", "new"}))
        ->capture_default_str();
    program.add_option("--seed", options.seed, "seed of the noise")
        ->check(RefuseNegative)
        ->capture_default_str();
    program.add_option("--light", options.light, "brightness of the lamp; 0 is dark")
        ->check(CLI::Range(0.0, 1e6))
        ->check(RefuseNan)
        ->capture_default_str();
    program.add_option("--gain", options.gain, "gain of the sensor's amplifier")
        ->check(CLI::Range(0.0, 1e6))
        ->check(RefuseNan)
        ->capture_default_str();
    program
        .add_option_function<double>(
            "--rate", [&](double rate) { options.bytesPerSecond = static_cast<std::uint64_t>(rate); },
            "bytes per second of readouts and scans, such as 53e6; without it, as fast as can be")
        ->check(CLI::Range(1.0, 1e12))
        ->check(RefuseNan)
        ->type_name("BYTES");
    program.add_flag("--integrate", options.takesIntegrationTime, "a readout takes its integration time");
    auto* const bytes = program
                            .add_option("--scan-bytes", options.scanBytes,
                                        "bytes that a measurement streams to a host that reads on")
                            ->check(RefuseNegative)
                            ->capture_default_str();
    program.add_option("--scan-records", options.scanRecords, "the same in readouts of 256 bytes")
        ->check(CLI::Range(std::uint64_t{1}, std::uint64_t{1} << 48))
        ->excludes(bytes);
    program.add_option("--button-after", options.buttonAfter, "press the button so long after each opening")
        ->type_name("MILLISECONDS");
    program.add_option("--faults", options.faults, "make transfers fail; see below")->type_name("PLAN");
    program.add_option("--for", options.seconds, "end by itself after so long")
        ->check(CLI::Range(0.0, 1e9))
        ->check(RefuseNan)
        ->type_name("SECONDS");
    program
        .add_option("--tcp", options.tcpPort,
                    "serve a kernel's `usbip attach` on 127.0.0.1 as well; the port is 3240 unless given, 0 "
                    "takes a free one")
        ->expected(0, 1)
        ->default_str(std::to_string(Usb::UsbIp::TcpPort))
        ->type_name("[PORT]");
    program.add_flag("--attach", options.attach,
                     "plug the instruments into this machine's kernel (as root, after modprobe vhci-hcd)");
    program.add_option("--capture", options.captureFile, "record the USB traffic in a pcapng file")
        ->type_name("FILE");
    program.add_flag("-v,--verbose", options.verbose, "tell on standard error what happens");
}

std::optional<int> ReadOptions(int argc, char** argv, ProgramOptions& options) {
    CLI::App program;
    DefineOptions(program, options);
    try {
        program.parse(argc, argv);
        return std::nullopt;
    } catch (const CLI::ParseError& error) {
        return program.exit(error) == 0 ? 0 : UsageError;
    }
}

std::vector<std::string> InstrumentNames(const ProgramOptions& options) {
    std::vector<std::string> names = options.names;
    if (names.size() > 1 && options.count > 1) {
        throw std::runtime_error("--count goes with one --name at most");
    }
    if (names.empty() || options.count > 1) {
        const std::string stem = names.empty() ? "" : names.front() + "-";
        names.clear();
        for (unsigned i = 1; i <= options.count; ++i) {
            names.push_back(stem + std::to_string(i));
        }
    }
    return names;
}

}  // namespace Varnholt::Simulator
