#include "Host.h"

#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>

#include "Away.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/SystemUsbBus.h"
#include "Service/Failure.h"

namespace Varnholt::Python {
namespace {

using Platform::Usb::UsbDevice;
using Service::Failure;
using Service::FailureKind;

std::atomic<bool> isForked{false};
constexpr std::uint8_t HighestDeviceNumber = 127;

/// A device and what must outlive it.
struct Recorded {
    std::shared_ptr<Capture::PcapngWriter> writer;
    std::shared_ptr<UsbDevice> device;
};

}  // namespace

Host& Host::Instance() {
    static Host* const host = new Host;  // threads may use it until the process ends
    return *host;
}

Host::Host() : files_(Platform::Drivers::MakeDriverFileSystem(bus_)) {
    pthread_atfork(nullptr, nullptr, [] {
        isForked = true;
        Away::ForgetOthers();
    });
}

void Host::CheckUsable() const {
    if (isForked) {
        throw Failure(FailureKind::Other, "this process was forked from one that had used instruments",
                      "start it with multiprocessing's method \"spawn\", or use ostra first after the fork");
    }
    if (isTimeVirtual_) {
        const std::lock_guard lock(mutex_);
        if (clock_ && clockThread_ != std::this_thread::get_id()) {
            throw Failure(FailureKind::Other,
                          "time is virtual: only the thread that made the simulation can use instruments");
        }
    }
}

bool Host::IsUsable() const {
    try {
        CheckUsable();
        return true;
    } catch (const Failure&) {
        return false;
    }
}

bool Host::IsForked() const {
    return isForked;
}

bool Host::IsTimeVirtual() const {
    return isTimeVirtual_;
}

std::string Host::AddSimulated(const std::string& name, Simulator::InstrumentSettings settings,
                               bool withVirtualTime) {
    CheckUsable();
    if (name.empty() || name.find_first_of("/\\") != std::string::npos) {
        throw Failure(FailureKind::BadArgument, "'" + name + "' is no name for an instrument",
                      "a name without slash and backslash");
    }
    // The process is in it, because the native transport locks an instrument's name for the whole machine.
    const std::string full = Platform::Usb::SimulatedPrefix + std::to_string(getpid()) + "-" + name;
    const std::lock_guard lock(mutex_);
    if (names_.contains(full)) {
        throw Failure(FailureKind::BadArgument, "there is a simulated instrument '" + name + "' already");
    }
    if (withVirtualTime != isTimeVirtual_ && (uses_ > 0 || !names_.empty())) {
        throw Failure(FailureKind::BadArgument,
                      "time is real or virtual for the whole process, and instruments are in use",
                      "close all instruments and simulations first");
    }
    if (withVirtualTime && !clock_) {
        clock_.emplace(settings.seed);
        clock_->HandleDeadlock([](const std::string& report) { std::fputs(report.c_str(), stderr); });
        clockThread_ = std::this_thread::get_id();
        isTimeVirtual_ = true;
    }
    simulated_.Add(full, std::move(settings));
    names_.insert(full);
    return full;
}

void Host::RemoveSimulated(const std::string& name) {
    simulated_.Remove(name);
    const std::lock_guard lock(mutex_);
    names_.erase(name);
    if (names_.empty() && clock_) {
        clock_.reset();
        isTimeVirtual_ = false;
    }
}

double Host::VirtualSeconds() const {
    const std::lock_guard lock(mutex_);
    return clock_ ? static_cast<double>(clock_->ElapsedMicroseconds()) / 1e6 : 0;
}

void Host::StartCapture(const std::string& file) {
    const std::lock_guard lock(mutex_);
    if (capture_) {
        throw Failure(FailureKind::BadArgument, "the traffic is recorded in " + captureFile_ + " already");
    }
    auto writer = std::make_shared<Capture::PcapngWriter>(file, "ostra " OSTRA_VERSION);
    if (writer->Failed()) {
        throw Failure(FailureKind::File, file + " cannot be written");
    }
    captureFile_ = file;
    capture_ = std::move(writer);
}

void Host::EndCapture() {
    const std::lock_guard lock(mutex_);
    const auto writer = std::exchange(capture_, nullptr);
    if (writer && writer->Failed()) {
        throw Failure(FailureKind::File, captureFile_ + " cannot be written");
    }
}

std::vector<std::string> Host::Bus::List() {
    std::vector<std::string> names;
    if (!host_.isTimeVirtual_) {  // what is real takes real time
        names = Platform::Usb::SystemUsbBus().List();
    }
    std::ranges::move(host_.simulated_.List(), std::back_inserter(names));
    return names;
}

bool Host::Bus::Has(const std::string& name) {
    return BusOf(name).Has(name);
}

Platform::Usb::UsbBus& Host::Bus::BusOf(const std::string& name) {
    const std::lock_guard lock(host_.mutex_);
    return host_.names_.contains(name) ? static_cast<Platform::Usb::UsbBus&>(host_.simulated_)
                                       : Platform::Usb::SystemUsbBus();
}

std::shared_ptr<UsbDevice> Host::Bus::Open(const std::string& name, Platform::ErrorCode& error) {
    std::shared_ptr<UsbDevice> device = BusOf(name).Open(name, error);
    const std::lock_guard lock(host_.mutex_);
    if (!device || !host_.capture_) {
        return device;
    }
    host_.captured_ = static_cast<std::uint8_t>(host_.captured_ % HighestDeviceNumber + 1);
    auto recorded = std::make_shared<Recorded>();
    recorded->writer = host_.capture_;
    recorded->device = Capture::CaptureDevice(std::move(device), *host_.capture_, host_.captured_);
    return {recorded, recorded->device.get()};
}

}  // namespace Varnholt::Python
