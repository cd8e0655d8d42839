#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <iterator>
#include <mutex>
#include <span>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/WaitLimit.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/StripReader.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/USBConnection.h"
#include "Platform/DeviceInterfaces.h"
#include "Platform/Time.h"
#include "Platform/WaitableObjects.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"
#include "Protocol/MaximumDevices.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace NativeDriver = Protocol::NativeDriver;
using Platform::WaitResult;
using Varnholt::Utilities::Multithreading::Mutex;
using Varnholt::Utilities::Multithreading::ScopedLock;

namespace {

constexpr std::uint32_t RecordsPerChunk = 10;
constexpr std::uint32_t RecordsOfFirstRead = 2;
constexpr std::uint32_t MaximumChunk = 65535;

NativeDriver::ControlBlock MakeBlock(std::uint8_t type, std::uint8_t request, std::uint16_t value) {
    NativeDriver::ControlBlock block{};
    block[NativeDriver::Block::Direction] = NativeDriver::DirectionOut;
    block[NativeDriver::Block::Type] = type;
    block[NativeDriver::Block::Request] = request;
    Protocol::StoreLittle16(&block[NativeDriver::Block::Value], value);
    return block;
}

std::uint32_t ChunkSize(std::uint32_t recordSize, const SourceLocation& caller = SourceLocation::current()) {
    if (recordSize > MaximumChunk / RecordsPerChunk) {
        throw IOException("Max packages size is 65535", Here(caller));
    }
    if (recordSize == 0) {
        throw IOException("Record size must not be 0", Here(caller));
    }
    return recordSize * RecordsPerChunk;
}

/// Collects the whole records of each transfer; of one that fails, none.
class RecordCollector final : public ScanReceiver {
  public:
    RecordCollector(ScanRecordList& list, std::size_t size) : records_(list), recordSize_(size) {}

    void Receive(std::span<const std::uint8_t> data) override {
        for (; data.size() >= recordSize_; data = data.subspan(recordSize_)) {
            records_.emplace_back(data.first(recordSize_));
        }
    }

  private:
    ScanRecordList& records_;
    const std::size_t recordSize_;
};

}  // namespace

/// What a message needs. The listener's thread shares the ownership while it delivers one, because the device
/// may be closed from inside that message, and because a thread that waits for the device lock cannot be
/// ended everywhere.
class PellandoUSBDevice::Core final : public EventListener {
  public:
    Core(EventListener* messageListener, const std::string& devicePath)
        : lock(StripStrangeChars(devicePath)),
          path(devicePath),
          listener(messageListener),
          control(path, NativeDriver::ControlPipe, Platform::NoHandle),
          read(path, NativeDriver::ReadPipe, Platform::NoHandle),
          write(path, NativeDriver::WritePipe, Platform::NoHandle) {}

    void MessageFromDevice(std::uint32_t code, std::uint32_t parameter) override {
        const bool isGone = code == Generic::MessageDeviceGone;
        if (isGone && isClosing) {
            return;  // without the lock: whoever closes the device waits for this thread
        }
        const ScopedLock held(lock);
        if (!listener || isClosed || (isGone && isClosing)) {
            return;
        }
        listener->MessageFromDevice(code, parameter);
        if (listener && isGone) {
            const std::lock_guard closing(closingLock);
            ClosePipes();
        }
    }

    void ClosePipes() {
        write.Close();
        read.Close();
        control.Close();
    }

    Mutex lock;  ///< the device lock
    const std::string path;
    EventListener* listener;  ///< guarded by `lock`
    USBConnection control;
    USBConnection read;
    USBConnection write;
    /// Keeps the pipes open for the controls that are sent without the device lock.
    Platform::RecursiveMutex closingLock;
    /// Closing ends the read of the interrupt pipe, which looks as if the instrument had gone.
    std::atomic<bool> isClosing = false;
    std::atomic<bool> isClosed = false;
};

PellandoUSBDevice::PellandoUSBDevice(EventListener* listener, const std::string& devicePath) try
    : core_(std::make_shared<Core>(listener, devicePath)), interruptListener_(devicePath) {
    const ScopedLock held(core_->lock);
    try {
        SetupInterruptListener();
    } catch (...) {
        // A message may wait for the lock, and its receiver belongs to an owner that gets no device.
        core_->isClosed = true;
        throw;
    }
}
TRACED

PellandoUSBDevice::~PellandoUSBDevice() {
    try {
        Shutdown();
    } catch (...) {  // the listener's own end stops its thread
    }
    core_->isClosed = true;
    core_->ClosePipes();
}

void PellandoUSBDevice::SetupInterruptListener() try {
    interruptListener_.SetListener(core_);
    interruptListener_.Start();
}
TRACED

void PellandoUSBDevice::Shutdown() try {
    core_->isClosing = true;
    HandleUntouchedButton();
    interruptListener_.Stop();
}
TRACED

/// Without the device lock, which somebody may hold for the length of a scan. Failures do not matter: the
/// instrument may be gone.
void PellandoUSBDevice::HandleUntouchedButton() try {
    if (interruptListener_.IsTouched()) {
        return;
    }
    const NativeDriver::ControlBlock abortPipe = MakeBlock(0, 0, Protocol::InterruptInEndpoint);
    const NativeDriver::ControlBlock buttonReport =
        MakeBlock(NativeDriver::TypeVendor, static_cast<std::uint8_t>(Protocol::Request::ButtonReport), 3);
    std::array<std::uint8_t, 8> data{};
    const auto length = static_cast<std::uint32_t>(data.size());
    const std::lock_guard open(core_->closingLock);
    core_->control.PerformDeviceIOControl(abortPipe, NativeDriver::ControlAbortPipe, data.data(), length,
                                          false);
    core_->control.PerformDeviceIOControl(buttonReport, NativeDriver::ControlButtonReport, data.data(),
                                          length, false);
}
TRACED

void PellandoUSBDevice::RemoveListener(EventListener*) try {
    const ScopedLock held(core_->lock);
    core_->listener = nullptr;
    interruptListener_.ClearListener();
}
TRACED

void PellandoUSBDevice::MessageFromDevice(std::uint32_t code, std::uint32_t parameter) try {
    const std::shared_ptr<Core> alive = core_;  // the message may close the device
    alive->MessageFromDevice(code, parameter);
}
TRACED

std::uint32_t PellandoUSBDevice::PerformDeviceIOControl(const NativeDriver::ControlBlock& block, void* data,
                                                        std::uint32_t length) try {
    const ScopedLock held(core_->lock);
    return core_->control.PerformDeviceIOControl(block, NativeDriver::ControlVendorRequest, data, length,
                                                 true);
}
TRACED

void PellandoUSBDevice::ReadData(void* buffer, std::uint32_t length, std::uint32_t timeout) try {
    const ScopedLock held(core_->lock);
    core_->read.Read(buffer, length, timeout);
}
TRACED

void PellandoUSBDevice::WriteData(const void* buffer, std::uint32_t length, std::uint32_t timeout) try {
    const ScopedLock held(core_->lock);
    core_->write.Write(buffer, length, timeout);
}
TRACED

void PellandoUSBDevice::ReadDataStrip(ScanRecordList& records, std::uint32_t recordSize,
                                      std::uint32_t timeout) try {
    RecordCollector collector(records, recordSize);
    ReadStrip(collector, PartialData::Dropped, recordSize, timeout, std::nullopt);
}
TRACED

void PellandoUSBDevice::ReadDataStrip(ScanReceiver& receiver, std::uint32_t recordSize,
                                      std::uint32_t timeout) try {
    ReadStrip(receiver, PartialData::Received, recordSize, timeout, std::nullopt);
}
TRACED

void PellandoUSBDevice::ReadDataCountedStrip(ScanRecordList& records, std::uint32_t recordSize,
                                             std::uint32_t timeout, std::uint32_t total) try {
    RecordCollector collector(records, recordSize);
    ReadStrip(collector, PartialData::Dropped, recordSize, timeout, total);
}
TRACED

void PellandoUSBDevice::ReadDataCountedStrip(ScanReceiver& receiver, std::uint32_t recordSize,
                                             std::uint32_t timeout, std::uint32_t total) try {
    ReadStrip(receiver, PartialData::Received, recordSize, timeout, total);
}
TRACED

/// A counted strip asks for its total and takes nothing else. Another begins with a small read, so that the
/// first data come soon, and goes on until less comes than was asked for.
void PellandoUSBDevice::ReadStrip(ScanReceiver& receiver, PartialData partialData, std::uint32_t recordSize,
                                  std::uint32_t timeout, std::optional<std::uint32_t> total) {
    const ScopedLock held(core_->lock);
    const std::uint32_t chunk = ChunkSize(recordSize);
    const std::uint32_t limit = WaitLimit(timeout, ScanGrace);
    const auto failed = [&](const char* what, const std::string& counts) {
        return (total ? "system busy. try again. Read data failed (" : "Read data failed (") +
               (what + (total ? counts : "")) + ")";
    };
    StripReader reader(core_->read, chunk);
    std::uint32_t remaining = total.value_or(0);
    const auto start = [&](std::uint32_t wanted) {
        const std::uint32_t size = total ? std::min(wanted, remaining) : wanted;
        remaining -= total ? size : 0;
        if (size > 0) {
            reader.Start(size);
        }
        return size;
    };
    std::uint32_t current = start(total ? chunk : RecordsOfFirstRead * recordSize);
    reader.Advance();
    for (bool isFirst = true;; isFirst = false) {
        const std::uint32_t next = start(chunk);
        receiver.Receive(reader.Arrived());
        if (current == 0) {
            return;
        }
        if (reader.Await(limit) == WaitResult::Abandoned) {
            throw TimeoutException(failed("Abandoned", " - remaining: " + std::to_string(remaining) +
                                                           " total: " + std::to_string(total.value_or(0))),
                                   Here());
        }
        if (isFirst && !total) {
            Platform::Beep(Protocol::BeepFrequency, Protocol::BeepDuration);
        }
        const std::uint32_t count = reader.Count();
        const bool fits = total ? count == current : count % recordSize == 0 && count <= current;
        if (!reader.HasSucceeded() || !fits) {
            const std::string counts = " - read: " + std::to_string(count) +
                                       ", expected: " + std::to_string(current) +
                                       ", remaining: " + std::to_string(remaining);
            if (partialData == PartialData::Received) {
                receiver.Receive(reader.EndAndTake());
            }
            if (!reader.HasSucceeded()) {
                throw IOException(failed("OverlappedRead", counts), Here(), reader.FailureCode());
            }
            const std::string text = failed("wrong data size", counts);
            throw total ? IOException(text, Here(), Shortfall{count, current}) : IOException(text, Here());
        }
        reader.Advance();
        current = total || count == current ? next : 0;
    }
}

const std::string& PellandoUSBDevice::GetAddress() const {
    return core_->path;
}

std::vector<std::string> PellandoUSBDevice::GetAllDevices() try {
    std::vector<std::string> paths;
    while (std::ssize(paths) < Protocol::MaximumDevices) {
        std::string path = ScanDevice(static_cast<std::uint16_t>(paths.size()));
        if (path.empty()) {
            break;
        }
        paths.push_back(std::move(path));
    }
    return paths;
}
TRACED

std::string PellandoUSBDevice::ScanDevice(std::uint16_t index) try {
    using Platform::DeviceInterfaces;
    constexpr Protocol::Guid interfaceClass = Protocol::NativeDriver::InterfaceClass;
    std::string path;
    const Platform::DeviceList list = DeviceInterfaces::MakeList(interfaceClass, true);
    const Platform::ErrorCode code = DeviceInterfaces::ReadPath(list, interfaceClass, index, path);
    return code == Platform::Errors::Success ? path : "";
}
TRACED

std::string PellandoUSBDevice::StripStrangeChars(const std::string& text) try {
    std::string kept;
    std::copy_if(text.begin(), text.end(), std::back_inserter(kept), [](char c) {
        return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
    });
    return kept;
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
