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
    : name("stand-in-" + std::to_string(index)) {
    Bus().Add(name, SettingsOf(index));
}

StandInInstrumentObject::~StandInInstrumentObject() = default;

void StandInInstrumentObject::Unplug() {
    unplugged = true;
    Bus().Unplug(name);
    // A fault can keep a transfer from the instrument, which then does not end it.
    for (const auto& file : Files()) {
        file->CancelAll();
    }
}

std::unique_ptr<Drivers::DriverFile> StandInInstrumentObject::Open(bool usbIo, std::uint32_t pipe,
                                                                   Platform::ErrorCode& error) {
    const std::lock_guard held(lock);
    std::shared_ptr<Drivers::SharedDevice> shared = device.lock();
    if (!shared && usedElsewhere && !otherUser) {
        otherUser = Bus().Open(name, error);
        if (otherUser) {
            otherUser->Claim();
        }
    }
    if (!shared) {
        shared = std::make_shared<Drivers::SharedDevice>(Bus(), name);
        device = shared;
        usbIoDevice.reset();
    }
    if (!usbIo) {
        return Drivers::NativeDriverFile::Open(std::move(shared), pipe, *this, error);
    }
    std::shared_ptr<Drivers::UsbIoDevice> opened = usbIoDevice.lock();
    if (!opened) {
        opened = std::make_shared<Drivers::UsbIoDevice>(std::move(shared));
        usbIoDevice = opened;
    }
    return std::make_unique<Drivers::UsbIoDriverFile>(std::move(opened), *this);
}

void StandInInstrumentObject::Add(StandInFileObject& file) {
    const std::lock_guard held(lock);
    files.insert(&file);
}

void StandInInstrumentObject::Remove(StandInFileObject& file) {
    const std::lock_guard held(lock);
    files.erase(&file);
}

std::size_t StandInInstrumentObject::OpenFiles() {
    const std::lock_guard held(lock);
    return files.size();
}

void StandInInstrumentObject::CancelEndpoint(const Drivers::SharedDevice&, std::uint8_t endpoint) {
    for (const auto& file : Files()) {
        file->CancelEndpoint(endpoint);
    }
}

std::vector<std::shared_ptr<StandInFileObject>> StandInInstrumentObject::Files() {
    std::vector<std::shared_ptr<StandInFileObject>> open;
    const std::lock_guard held(lock);
    for (StandInFileObject* file : files) {
        if (auto living = file->weak_from_this().lock()) {
            open.push_back(std::move(living));
        }
    }
    return open;
}

SimulatedInstrument& StandInInstrumentObject::Simulated() {
    return Bus().Instrument(name);
}

std::string StandInInstrumentObject::TakeTranscript() {
    std::string transcript = Recorder().Text(TestControls::TranscriptBytes);
    Recorder().Clear();
    return transcript;
}

void StandInInstrumentObject::SetFaults(const std::string& plan) {
    Bus().SetFaults(name, FaultPlan::Parse(plan));
}

}  // namespace Varnholt::Simulator
