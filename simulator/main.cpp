// The program ostra-simulator.
#include <poll.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <csignal>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "EepromFile.h"
#include "FaultPlan.h"
#include "FreshEeprom.h"
#include "Platform/Usb/PcapngWriter.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UsbCapture.h"
#include "PollLoop.h"
#include "SimulatedInstrument.h"
#include "UsbIpServer.h"

namespace {

using namespace Varnholt::Simulator;
namespace Protocol = Varnholt::Protocol;
namespace Usb = Varnholt::Platform::Usb;

struct Options {
    std::vector<std::string> names;
    unsigned count = 1;
    std::vector<std::string> eepromFiles;
    std::string imageFile;
    std::string firmware = "new";
    std::uint64_t seed = 1;
    double light = 1.0;
    double gain = 1.0;
    std::uint64_t bytesPerSecond = 0;
    bool takesIntegrationTime = false;
    std::uint64_t scanBytes = Protocol::ReadoutBytes;
    std::uint64_t scanRecords = 0;
    std::optional<std::uint32_t> buttonAfter;
    std::string faults;
    double seconds = 0;
    std::optional<std::uint16_t> tcpPort;
    int connectedSocket = -1;
    std::string captureFile;
    bool verbose = false;
};

constexpr const char* Footer = R"(
A simulated instrument is found by libostra and by the tool ostra like a real one, under the name
simulated-NAME, for as long as this program runs; only programs of the same user, or of root, can use it.
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
  ostra-simulator --faults "bulk-in 0:stall; 7+:silent"
      the first bulk IN transfer stalls, and from transfer 7 on nothing answers

Faults are written INDEX:FAULT, several separated by semicolons. INDEX counts the transfers from 0, anew each
time that the instrument is opened; with a + behind it the fault stays from then on. In front of it may
stand which transfers are counted instead of all: control, bulk-in, bulk-out or interrupt. The faults:
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

void Define(CLI::App& program, Options& options) {
    program.footer(Footer + FaultHelp());
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
    program.add_option("--seed", options.seed, "of the noise")->capture_default_str();
    program.add_option("--light", options.light, "brightness of the lamp; 0 is dark")
        ->check(CLI::Range(0.0, 1e6))
        ->capture_default_str();
    program.add_option("--gain", options.gain, "of the sensor's amplifier")
        ->check(CLI::Range(0.0, 1e6))
        ->capture_default_str();
    program
        .add_option_function<double>(
            "--rate", [&](double rate) { options.bytesPerSecond = static_cast<std::uint64_t>(rate); },
            "bytes per second of readouts and scans, such as 53e6; without it, as fast as can be")
        ->check(CLI::Range(1.0, 1e12))
        ->type_name("BYTES");
    program.add_flag("--integrate", options.takesIntegrationTime, "a readout takes its integration time");
    auto* const bytes = program
                            .add_option("--scan-bytes", options.scanBytes,
                                        "bytes that a measurement streams to a host that reads on")
                            ->capture_default_str();
    program.add_option("--scan-records", options.scanRecords, "the same in readouts of 256 bytes")
        ->check(CLI::Range(std::uint64_t{1}, std::uint64_t{1} << 48))
        ->excludes(bytes);
    program.add_option("--button-after", options.buttonAfter, "press the button so long after each opening")
        ->type_name("MILLISECONDS");
    program.add_option("--faults", options.faults, "make transfers fail; see below")->type_name("PLAN");
    program.add_option("--for", options.seconds, "end by itself after so long")
        ->check(CLI::Range(0.0, 1e9))
        ->type_name("SECONDS");
    program
        .add_option("--tcp", options.tcpPort,
                    "serve a kernel's `usbip attach` on 127.0.0.1 as well; the port is 3240 unless given, 0 "
                    "takes a free one")
        ->expected(0, 1)
        ->default_str(std::to_string(Usb::UsbIp::TcpPort))
        ->type_name("[PORT]");
    program
        .add_option(
            "--connected-socket", options.connectedSocket,
            "serve the first instrument on this inherited socket, whose other end is handed to a kernel")
        ->type_name("FD");
    program.add_option("--capture", options.captureFile, "record the USB traffic in a pcapng file")
        ->type_name("FILE");
    program.add_flag("-v,--verbose", options.verbose, "tell on standard error what happens");
}

std::vector<std::string> InstrumentNames(const Options& options) {
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

InstrumentSettings MakeSettings(const Options& options, std::size_t index) {
    InstrumentSettings settings;
    settings.serial = "SIM" + std::to_string(10001 + index).substr(1);
    settings.chipId.back() = static_cast<std::uint8_t>(settings.chipId.back() + index);
    settings.firmware = options.firmware == "old" ? OldFirmware : NewFirmware;
    settings.seed = options.seed + index;
    settings.light = options.light;
    settings.gain = options.gain;
    settings.bytesPerSecond = options.bytesPerSecond;
    settings.takesIntegrationTime = options.takesIntegrationTime;
    settings.scanBytes =
        options.scanRecords ? options.scanRecords * Protocol::ReadoutBytes : options.scanBytes;
    settings.buttonAfterMilliseconds = options.buttonAfter;
    settings.eeprom = options.imageFile.empty() ? FreshEeprom() : ReadEepromFile(options.imageFile);
    return settings;
}

/// SIGINT and SIGTERM, as a file to watch.
int BlockedStopSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGTERM);
    sigprocmask(SIG_BLOCK, &signals, nullptr);
    return signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK);
}

void Run(const Options& options) {
    PollLoop loop;
    const Log complain = [](const std::string& line) {
        std::cerr << "ostra-simulator: " << line << std::endl;
    };
    const Log log = options.verbose ? complain : Log();
    const std::vector<std::string> names = InstrumentNames(options);
    if (options.eepromFiles.size() > names.size()) {
        throw std::runtime_error("more --eeprom files than instruments");
    }
    const FaultPlan faults = FaultPlan::Parse(options.faults);
    std::unique_ptr<Usb::PcapngWriter> capture;
    if (!options.captureFile.empty()) {
        capture = std::make_unique<Usb::PcapngWriter>(options.captureFile, "ostra-simulator");
        if (capture->Failed()) {
            throw std::runtime_error("cannot write " + options.captureFile);
        }
    }

    std::vector<std::unique_ptr<EepromFile>> files;
    UsbIpServer server(loop, log);
    for (std::size_t i = 0; i < names.size(); ++i) {
        InstrumentSettings settings = MakeSettings(options, i);
        EepromFile* file = nullptr;
        if (i < options.eepromFiles.size()) {
            file = files.emplace_back(std::make_unique<EepromFile>(loop, options.eepromFiles[i], complain))
                       .get();
            if (file->Exists()) {
                settings.eeprom = ReadEepromFile(options.eepromFiles[i]);
            }
            settings.memoryChanged = [file] { file->MemoryChanged(); };
        }
        const auto instrument = std::make_shared<SimulatedInstrument>(loop, std::move(settings));
        UsbIpServer::Export exported{names[i], instrument, faults, {}};
        if (capture) {
            const auto number = static_cast<std::uint8_t>(i + 1);
            exported.wrap = [&capture, number](std::shared_ptr<Usb::UsbDevice> device) {
                return Usb::CaptureDevice(std::move(device), *capture, number);
            };
        }
        server.Add(std::move(exported));
        if (file) {
            file->Keep(instrument);
        }
    }
    if (options.connectedSocket >= 0) {
        server.Serve(options.connectedSocket, names.front());
    }

    const int stopSignals = BlockedStopSignals();
    loop.Watch(stopSignals, POLLIN, [&loop] { loop.Stop(); });
    if (options.seconds > 0) {
        loop.CallAt(loop.Now() + static_cast<std::uint64_t>(options.seconds * 1e6), [&loop] { loop.Stop(); });
    }
    if (options.tcpPort) {
        const std::uint16_t port = server.ListenTcp(*options.tcpPort);
        for (const std::string& name : names) {
            std::cout << "ready: usbip --tcp-port " << port << " attach -r 127.0.0.1 -b "
                      << server.TcpBusId(name) << "  (" << name << ")\n";
        }
    }
    for (const std::string& name : names) {
        std::cout << "ready: " << Usb::SimulatedPrefix << name << "\n";
    }
    std::cout << std::flush;
    loop.Run();
    loop.Unwatch(stopSignals);
    close(stopSignals);
    if (capture && capture->Failed()) {
        complain(options.captureFile + " is incomplete");
    }
}

}  // namespace

int main(int argc, char** argv) {
    constexpr int usageError = 2;
    Options options;
    CLI::App program("Simulates the instrument, so that everything runs without hardware.");
    Define(program, options);
    try {
        program.parse(argc, argv);
    } catch (const CLI::ParseError& error) {
        return program.exit(error) == 0 ? 0 : usageError;
    }
    try {
        Run(options);
        return 0;
    } catch (const std::exception& error) {
        std::cerr << "ostra-simulator: " << error.what() << "\n";
        return usageError;
    }
}
