// The program ostra-simulator.
#include <poll.h>
#include <sys/signalfd.h>
#include <sys/socket.h>

#include <algorithm>
#include <csignal>
#include <exception>
#include <iostream>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "Capture/PcapngWriter.h"
#include "Capture/UsbCapture.h"
#include "EepromFile.h"
#include "EepromImageFile.h"
#include "FaultPlan.h"
#include "FreshEeprom.h"
#include "KernelPort.h"
#include "Platform/Linux/FileDescriptor.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/SimulatorBus.h"
#include "PollLoop.h"
#include "ProgramOptions.h"
#include "SimulatedInstrument.h"
#include "UsbIpServer.h"
#include "Utilities/Files/Linux/StandardStreams.h"

namespace {

using namespace Varnholt::Simulator;
namespace Protocol = Varnholt::Protocol;
namespace Usb = Varnholt::Platform::Usb;
using Varnholt::Platform::Linux::FileDescriptor;

InstrumentSettings MakeSettings(const ProgramOptions& options, std::size_t index) {
    InstrumentSettings settings = SettingsOfNumber(index);
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
FileDescriptor BlockedStopSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGTERM);
    sigprocmask(SIG_BLOCK, &signals, nullptr);
    return FileDescriptor(signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK));
}

/// Plugs an instrument into the kernel, by a socket whose other end, which is answered, is to be served.
FileDescriptor Attach(UsbIpServer& server, const std::string& name) {
    int ends[2] = {-1, -1};
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) {
        throw std::runtime_error("no socket for the kernel");
    }
    FileDescriptor served(ends[0]);
    const FileDescriptor ofKernel(ends[1]);
    const unsigned port = PlugIntoKernel(ofKernel.Get(), server.Record(name).DeviceId());
    std::cout << "ready: plugged into port " << port << " of the kernel  (" << name << ")\n";
    return served;
}

void Complain(const std::string& line) {
    std::cerr << "ostra-simulator: " << line << std::endl;
}

/// The instruments of a program, with what they write to.
class Instruments final {
  public:
    Instruments(PollLoop& pollLoop, const ProgramOptions& programOptions)
        : loop_(pollLoop),
          options_(programOptions),
          names_(InstrumentNames(options_)),
          server_(loop_, options_.verbose ? Log(Complain) : Log()) {
        if (options_.eepromFiles.size() > names_.size()) {
            throw std::runtime_error("more --eeprom files than instruments");
        }
        const FaultPlan faults = FaultPlan::Parse(options_.faults);
        for (std::size_t i = 0; i < names_.size(); ++i) {
            Add(i, faults);
        }
    }

    /// Makes them reachable, and says how.
    void Offer() {
        const std::uint16_t port = options_.tcpPort ? server_.ListenTcp(*options_.tcpPort) : 0;
        std::vector<FileDescriptor> kernelSockets;
        for (std::size_t i = 0; options_.attach && i < names_.size(); ++i) {
            kernelSockets.push_back(Attach(server_, names_[i]));
        }
        if (!options_.captureFile.empty()) {  // made last: nothing is emptied by a start that fails
            capture_.emplace(options_.captureFile, "ostra-simulator");
            if (capture_->Failed()) {
                throw std::runtime_error("cannot write " + options_.captureFile);
            }
        }
        for (std::size_t i = 0; i < kernelSockets.size(); ++i) {
            server_.Serve(std::move(kernelSockets[i]), names_[i], Usb::KernelAsUser);
        }
        for (std::size_t i = 0; options_.tcpPort && i < names_.size(); ++i) {
            std::cout << "ready: usbip --tcp-port " << port << " attach -r 127.0.0.1 -b "
                      << server_.Record(names_[i]).busId << "  (" << names_[i] << ")\n";
        }
        for (const std::string& name : names_) {
            std::cout << "ready: " << Usb::SimulatedPrefix << name << "\n";
        }
        std::cout << std::flush;
    }

    /// Completes what they write to.
    void Finish() {
        if (capture_ && capture_->Failed()) {
            Complain(options_.captureFile + " is incomplete");
        }
        if (std::ranges::count_if(files_, [](const auto& file) { return !file->Finish(); }) > 0) {
            throw std::runtime_error("what was written to the EEPROM is lost");
        }
    }

  private:
    void Add(std::size_t index, const FaultPlan& faults) {
        InstrumentSettings settings = MakeSettings(options_, index);
        EepromFile* file = nullptr;
        if (index < options_.eepromFiles.size()) {
            const std::string& path = options_.eepromFiles[index];
            file = files_.emplace_back(std::make_unique<EepromFile>(loop_, path, Complain)).get();
            if (file->Exists()) {
                settings.eeprom = ReadEepromFile(path);
            }
            settings.memoryChanged = [file] { file->MemoryChanged(); };
        }
        const auto instrument = std::make_shared<SimulatedInstrument>(loop_, std::move(settings));
        UsbIpServer::Export exported{names_[index], instrument, faults, {}};
        if (!options_.captureFile.empty()) {
            const auto number = static_cast<std::uint8_t>(index + 1);
            exported.wrap = [this, number](std::shared_ptr<Usb::UsbDevice> device) {
                return Varnholt::Capture::CaptureDevice(std::move(device), *capture_, number);
            };
        }
        server_.Add(std::move(exported));
        if (file) {
            file->Keep(instrument);
        }
    }

    PollLoop& loop_;
    const ProgramOptions& options_;
    const std::vector<std::string> names_;
    std::optional<Varnholt::Capture::PcapngWriter> capture_;
    std::vector<std::unique_ptr<EepromFile>> files_;
    UsbIpServer server_;
};

void Run(const ProgramOptions& options) {
    PollLoop loop;
    Instruments instruments(loop, options);
    const FileDescriptor stopSignals = BlockedStopSignals();  // who reads "ready" may send one at once
    instruments.Offer();
    loop.Watch(stopSignals.Get(), POLLIN, [&loop] { loop.Stop(); });
    if (options.seconds > 0) {
        loop.CallAt(loop.Now() + static_cast<std::uint64_t>(options.seconds * 1e6), [&loop] { loop.Stop(); });
    }
    loop.Run();
    instruments.Finish();
}

}  // namespace

int main(int argc, char** argv) {
    Varnholt::Utilities::Files::SecureStandardStreams();
    ProgramOptions options;
    if (const std::optional<int> code = ReadOptions(argc, argv, options)) {
        return *code;
    }
    try {
        Run(options);
        return 0;
    } catch (const std::exception& error) {
        std::cerr << "ostra-simulator: " << error.what() << "\n";
        return UsageError;
    }
}
