#include "StandInInstrument.h"

#include <vector>

#include "Platform/Drivers/NativeDriverFile.h"
#include "Platform/Drivers/UsbIoDriverFile.h"
#include "Platform/EventScheduler.h"
#include "SimulatedBus.h"
#include "StandInFile.h"
#include "TestControls.h"
#include "TransferRecorder.h"

namespace Varnholt::Simulator {
namespace {

namespace Drivers = Platform::Drivers;

// Never destroyed: the driver process is ended, not left in an orderly way.

TransferRecorder& Recorder() {
    static auto& recorder = *new TransferRecorder;
    return recorder;
}

SimulatedBus* MakeRecordedBus() {
    auto* const bus = new SimulatedBus(Platform::ClockScheduler());
    bus->WrapDevices([](const std::string&, auto device) { return Recorder().Record(std::move(device)); });
    return bus;
}

SimulatedBus& Bus() {
    static auto& bus = *MakeRecordedBus();
    return bus;
}

InstrumentSettings SettingsOf(unsigned long index) {
    InstrumentSettings settings;
    settings.serial = "STANDIN" + std::to_string(index);
    settings.seed = index + 1;
    return settings;
}

}  // namespace

StandInInstrumentObject::StandInInstrumentObject(unsigned long index)
    : name_("stand-in-" + std::to_string(index)) {
    Bus().Add(name_, SettingsOf(index));
}

StandInInstrumentObject::~StandInInstrumentObject() = default;

void StandInInstrumentObject::Unplug() {
    unplugged_ = true;
    Bus().Unplug(name_);
    // A fault can keep a transfer from the instrument, which then does not end it.
    for (const auto& file : Files()) {
        file->CancelAll();
    }
}

std::unique_ptr<Drivers::DriverFile> StandInInstrumentObject::Open(bool usbIo, std::uint32_t pipe,
                                                                   Platform::ErrorCode& error) {
    const std::lock_guard held(lock_);
    std::shared_ptr<Drivers::SharedDevice> shared = device_.lock();
    if (!shared && usedElsewhere_ && !otherUser_) {
        otherUser_ = Bus().Open(name_, error);
        if (otherUser_) {
            otherUser_->Claim();
        }
    }
    if (!shared) {
        const auto abort = [this](const Drivers::SharedDevice&, std::uint8_t endpoint) {
            for (const auto& file : Files()) {
                file->CancelEndpoint(endpoint);
            }
        };
        shared = std::make_shared<Drivers::SharedDevice>(Bus(), name_, abort);
        device_ = shared;
        usbIoDevice_.reset();
    }
    if (!usbIo) {
        return Drivers::NativeDriverFile::Open(std::move(shared), pipe, error);
    }
    std::shared_ptr<Drivers::UsbIoDevice> opened = usbIoDevice_.lock();
    if (!opened) {
        opened = std::make_shared<Drivers::UsbIoDevice>(std::move(shared));
        usbIoDevice_ = opened;
    }
    return std::make_unique<Drivers::UsbIoDriverFile>(std::move(opened));
}

void StandInInstrumentObject::Add(const std::shared_ptr<StandInFileObject>& file) {
    const std::lock_guard held(lock_);
    std::erase_if(files_, [](const auto& closed) { return closed.expired(); });
    files_.push_back(file);
}

std::vector<std::shared_ptr<StandInFileObject>> StandInInstrumentObject::Files() {
    std::vector<std::shared_ptr<StandInFileObject>> open;
    const std::lock_guard held(lock_);
    for (const auto& file : files_) {
        if (auto living = file.lock()) {
            open.push_back(std::move(living));
        }
    }
    return open;
}

SimulatedInstrument& StandInInstrumentObject::Simulated() {
    return Bus().Instrument(name_);
}

std::string StandInInstrumentObject::TakeTranscript() {
    std::string transcript = Recorder().Text(TestControls::TranscriptBytes);
    Recorder().Clear();
    return transcript;
}

void StandInInstrumentObject::SetFaults(const std::string& plan) {
    Bus().SetFaults(name_, FaultPlan::Parse(plan));
}

}  // namespace Varnholt::Simulator
