#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <iterator>
#include <limits>
#include <list>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Generic/Utilities/Timing.h"
#include "DeviceDriver/Ostra/LowLevel/WaitLimit.h"
#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "Platform/ErrorCodes.h"
#include "Platform/ScopedThreadPriority.h"
#include "Platform/Time.h"
#include "Protocol/MaximumDevices.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace DataStage = Protocol::DataStage;
using namespace Protocol::UsbIoDriver;
using Protocol::Request;
using UsbIo::CUsbIo;
using UsbIo::CUsbIoBuffer;
using UsbIo::CUsbIoPipe;
using Varnholt::Utilities::Tools::SmartPointer;

namespace {

constexpr std::uint32_t CommandPause = 1;  // milliseconds before every vendor request
constexpr std::uint64_t MillisecondsPerSecond = 1000;
constexpr std::uint64_t ReadGrace = 5000;  // milliseconds on top of every time-out

// Scans.
constexpr std::uint32_t ScanTransferSize = MaximumTransferSize;
constexpr std::uint32_t OpenEndedScanStartSize = 1280000;
constexpr std::uint64_t MaximumScanSize = std::numeric_limits<std::uint32_t>::max();  // callers' counts
constexpr std::uint32_t ScanRecordSize = 256;
constexpr std::uint32_t ScanRecordTime = 15;  // milliseconds that the instrument may take for one

constexpr std::uint32_t BeepDelay = 370;

void ThrowIfUsbIoError(std::uint32_t status, const char* operation) {
    if (status == Status::Success) {
        return;
    }
    std::array<char, 1024> text;
    throw IOException(std::string("Error in UsbIo function: \"") + operation +
                          "\" Error: " + CUsbIo::ErrorText(text.data(), text.size(), status),
                      Here(), status);
}

template <std::size_t Size>
void Put(std::vector<std::uint8_t>& data, std::size_t offset, const std::array<std::uint8_t, Size>& value) {
    std::copy(value.begin(), value.end(), data.begin() + static_cast<std::ptrdiff_t>(offset));
}

template <std::size_t Size>
void Take(const std::vector<std::uint8_t>& data, std::size_t offset, std::array<std::uint8_t, Size>& value) {
    std::copy_n(data.begin() + static_cast<std::ptrdiff_t>(offset), Size, value.begin());
}

}  // namespace

PellandoFunctionality_Win64::PellandoFunctionality_Win64(Generic::EventListener* listener,
                                                         std::uint32_t deviceIndex) try
    : device_(new CUsbIo),
      writePipe_(new CUsbIoPipe),
      readPipe_(new CUsbIoPipe),
      interruptPipe_(new CUsbIoPipe) {
    InitUSBIO(deviceIndex);
    interruptListener_ = SmartPointer<InterruptListener_Win64>(new InterruptListener_Win64(devicePath_));
    interruptListener_->SetPipe(interruptPipe_);
    interruptListener_->SetListener(listener);
    interruptListener_->Start();
}
TRACED

PellandoFunctionality_Win64::~PellandoFunctionality_Win64() = default;

void PellandoFunctionality_Win64::InitUSBIO(std::uint32_t deviceIndex) try {
    const std::list<std::string> names = USB::USBBrowser::Instance(Transport::UsbIo)->GetDevices(0);
    if (deviceIndex >= names.size()) {
        throw IOException("No such device connected", Here(), Platform::Errors::FileNotFound);
    }
    const std::string& wanted = *std::next(names.begin(), static_cast<std::ptrdiff_t>(deviceIndex));
    const Platform::DeviceList list = UsbIo::CUsbIo::CreateDeviceList(&InterfaceClass);
    if (!list) {
        throw IOException("Unable to create device list.", Here());
    }
    for (int number = 0; number < Protocol::MaximumDevices; ++number) {
        if (device_->Open(number, list, &InterfaceClass) != Status::Success) {
            break;
        }
        if (device_->GetDevicePathName() == wanted) {
            devicePath_ = wanted;
            Configure(number, list);
            return;
        }
        device_->Close();
    }
    throw IOException("requested device not found", Here(), Platform::Errors::FileNotFound);
}
TRACED

void PellandoFunctionality_Win64::Configure(int deviceNumber, Platform::DeviceList list) {
    ThrowIfUsbIoError(device_->UnconfigureDevice(), "UnconfigureDevice");
    const std::array<UsbIo::InterfaceSetting, 1> interfaces{{{0, 0, MaximumTransferSize}}};
    ThrowIfUsbIoError(device_->SetConfiguration({0, interfaces}), "SetConfiguration");
    UsbIo::DeviceParameters parameters;
    ThrowIfUsbIoError(device_->GetDeviceParameters(parameters), "GetDeviceParameters");
    parameters.words[1] = 0;
    ThrowIfUsbIoError(device_->SetDeviceParameters(parameters), "SetDeviceParameters");
    const auto bind = [&](CUsbIoPipe& pipe, std::uint8_t endpoint, const char* operation) {
        ThrowIfUsbIoError(pipe.Bind(deviceNumber, endpoint, list, &InterfaceClass), operation);
    };
    bind(*writePipe_, Protocol::BulkOutEndpoint, "BindTX");
    bind(*readPipe_, Protocol::BulkInEndpoint, "BindRX");
    bind(*interruptPipe_, Protocol::InterruptInEndpoint, "BindIR");
}

void PellandoFunctionality_Win64::VendorOutRequest(Request request, const Bytes& data,
                                                   std::uint16_t value) try {
    Platform::SleepMilliseconds(CommandPause);
    UsbIo::ClassOrVendorRequest block;
    block.request = static_cast<std::uint8_t>(request);
    block.value = value;
    auto length = static_cast<std::uint32_t>(data.size());
    ThrowIfUsbIoError(device_->ClassOrVendorOutRequest(data.empty() ? nullptr : data.data(), length, block),
                      "ClassOrVendorOutRequest");
    DataStageEnded(static_cast<std::uint32_t>(data.size()), length);
}
TRACED

void PellandoFunctionality_Win64::VendorInRequest(Request request, Bytes& data) try {
    Platform::SleepMilliseconds(CommandPause);
    UsbIo::ClassOrVendorRequest block;
    block.request = static_cast<std::uint8_t>(request);
    auto length = static_cast<std::uint32_t>(data.size());
    ThrowIfUsbIoError(device_->ClassOrVendorInRequest(data.empty() ? nullptr : data.data(), length, block),
                      "ClassOrVendorInRequest");
    DataStageEnded(static_cast<std::uint32_t>(data.size()), length);
}
TRACED

void PellandoFunctionality_Win64::ReadData(std::uint8_t* buffer, std::uint32_t length,
                                           std::uint64_t timeout) try {
    std::uint32_t moved = length;
    ThrowIfUsbIoError(readPipe_->ReadSync(buffer, moved, WaitLimit(timeout + ReadGrace)), "ReadSync");
    DataStageEnded(length, moved);
}
TRACED

void PellandoFunctionality_Win64::WriteData(const std::uint8_t* buffer, std::uint32_t length) try {
    std::uint32_t moved = length;
    ThrowIfUsbIoError(writePipe_->WriteSync(buffer, moved, Platform::Infinite), "WriteSync");
    DataStageEnded(length, moved);
}
TRACED

void PellandoFunctionality_Win64::RemoveListener(Generic::EventListener*) try {
    if (!interruptListener_.IsEmpty()) {
        interruptListener_->ClearListener();
    }
}
TRACED

void PellandoFunctionality_Win64::MeasureRequest(std::uint8_t* buffer, std::uint32_t length,
                                                 std::uint32_t timeoutSeconds) try {
    VendorOutRequest(Request::Measure, {});
    ReadData(buffer, length, timeoutSeconds * MillisecondsPerSecond);
}
TRACED

void PellandoFunctionality_Win64::SetMeasureParameters(const Bytes2& p1, const Bytes2& p2, const Bytes2& p3,
                                                       std::uint8_t p4) try {
    Bytes data(DataStage::MeasureParametersSize);
    Put(data, DataStage::P1, p1);
    Put(data, DataStage::P2, p2);
    Put(data, DataStage::P3, p3);
    data[DataStage::P4] = p4;
    VendorOutRequest(Request::SetMeasureParameters, data);
}
TRACED

void PellandoFunctionality_Win64::GetMeasureParameters(Bytes2& p1, Bytes2& p2, Bytes2& p3, std::uint8_t& p4,
                                                       std::uint8_t& p5) try {
    Bytes data(DataStage::MeasureParametersSize);
    VendorInRequest(Request::GetMeasureParameters, data);
    Take(data, DataStage::P1, p1);
    Take(data, DataStage::P2, p2);
    Take(data, DataStage::P3, p3);
    p4 = data[DataStage::P4];
    p5 = data[DataStage::P5];
}
TRACED

void PellandoFunctionality_Win64::SetMeasureMode(std::uint8_t mode) try {
    VendorOutRequest(Request::SetMeasureMode, {mode});
}
TRACED

void PellandoFunctionality_Win64::GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3,
                                                 std::uint8_t& m4, std::uint8_t& m5, std::uint8_t& m6) try {
    Bytes data(DataStage::MeasureModeSize);
    VendorInRequest(Request::GetMeasureMode, data);
    m1 = data[0];
    m2 = data[1];
    m3 = data[2];
    m4 = data[3];
    m5 = data[4];
    m6 = data[5];
}
TRACED

void PellandoFunctionality_Win64::WriteEEPROM(const Bytes4& address, const Bytes2& length,
                                              const std::uint8_t* data, std::uint32_t count) try {
    WriteMemory(Request::WriteEeprom, address, length, data, count);
}
TRACED

void PellandoFunctionality_Win64::DownloadEEPROMFirmware(const Bytes4& address, const Bytes2& length,
                                                         const std::uint8_t* image, std::uint32_t count) try {
    WriteMemory(Request::DownloadEepromFirmware, address, length, image, count);
}
TRACED

void PellandoFunctionality_Win64::WriteMemory(Request request, const Bytes4& address, const Bytes2& length,
                                              const std::uint8_t* data, std::uint32_t count) {
    Bytes block(DataStage::MemoryRequestSize);
    Put(block, DataStage::Address, address);
    Put(block, DataStage::Length, length);
    VendorOutRequest(request, block);
    WriteData(data, count);
    const std::uint8_t end = 0;
    WriteData(&end, sizeof(end));
    WriteData(&end, sizeof(end));
}

void PellandoFunctionality_Win64::ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                                             std::uint32_t count) try {
    Bytes block(DataStage::MemoryRequestSize);
    Put(block, DataStage::Address, address);
    Put(block, DataStage::Length, length);
    VendorOutRequest(Request::ReadEeprom, block);
    ReadData(data, count, count);
}
TRACED

void PellandoFunctionality_Win64::WriteCPLD(const Bytes2& c1, const Bytes2& c2, const Bytes2& c3) try {
    Bytes data(DataStage::WriteCpldSize);
    Put(data, DataStage::C1, c1);
    Put(data, DataStage::C2, c2);
    Put(data, DataStage::C3, c3);
    VendorOutRequest(Request::WriteCpld, data);
}
TRACED

void PellandoFunctionality_Win64::ReadCPLD(Bytes2& value) try {
    Bytes data(DataStage::ReadCpldSize);
    VendorInRequest(Request::ReadCpld, data);
    Take(data, 0, value);
}
TRACED

void PellandoFunctionality_Win64::DownloadRAMFirmware(std::uint16_t address, const std::uint8_t* image,
                                                      std::uint32_t count) try {
    VendorOutRequest(Request::DownloadRamFirmware, Bytes(image, image + count), address);
}
TRACED

void PellandoFunctionality_Win64::GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4,
                                          Bytes2& m5) try {
    Bytes data(DataStage::MiscSize);
    VendorInRequest(Request::GetMisc, data);
    Take(data, DataStage::M2, m2);
    Take(data, DataStage::M4, m4);
    Take(data, DataStage::M5, m5);
    m1 = data[DataStage::M1];
    m3 = data[DataStage::M3];
}
TRACED

void PellandoFunctionality_Win64::GetChipID(std::uint8_t* id) try {
    Bytes data(DataStage::ChipIdSize);
    VendorInRequest(Request::GetChipId, data);
    std::copy(data.begin(), data.end(), id);
}
TRACED

void PellandoFunctionality_Win64::Reset(const Bytes2& code) try {
    VendorOutRequest(Request::Reset, {code[1]});
}
TRACED

void PellandoFunctionality_Win64::GetDeviceIdentifier(std::string& identifier) try {
    identifier = device_->GetDevicePathName();
}
TRACED

void PellandoFunctionality_Win64::StartScan(std::uint32_t, std::uint32_t timeoutSeconds,
                                            std::uint32_t total) try {
    PrepareScan(total);
    receiverLimit_ = WaitLimit(timeoutSeconds * MillisecondsPerSecond + ScanGrace);
    if (!IsFixedSize()) {
        StartBeep();
    }
    const Platform::ScopedThreadPriority priority(Platform::HighestThreadPriority);
    VendorOutRequest(Request::Measure, {});
    ReadMeasureData();
    scanEnd_ = static_cast<std::uint32_t>(scanData_.Size());
}
TRACED

void PellandoFunctionality_Win64::GetScanData(std::uint8_t* buffer, std::uint32_t* size) try {
    *size = std::min(*size, scanEnd_ - readPosition_);
    std::copy_n(scanData_.Data() + readPosition_, *size, buffer);
    readPosition_ += *size;
}
TRACED

void PellandoFunctionality_Win64::PrepareScan(std::uint32_t total) {
    scanTotal_ = total;
    received_ = 0;
    readPosition_ = 0;
    scanEnd_ = 0;
    if (Receiver() == nullptr) {
        scanData_.Reset(IsFixedSize() ? scanTotal_ : OpenEndedScanStartSize);
    } else {
        scanData_.Reset(0);
    }
}

void PellandoFunctionality_Win64::ReadMeasureData() try {
    // Whichever way this block is left: a buffer is gone only when its transfer has ended.
    CUsbIoBuffer a(ScanTransferSize);
    CUsbIoBuffer b(ScanTransferSize);
    if (!a.Buffer || !b.Buffer) {
        throw std::bad_alloc();
    }
    CUsbIoBuffer* current = &a;
    CUsbIoBuffer* next = &b;
    current->NumberOfBytesToTransfer =
        IsFixedSize() ? std::min(scanTotal_, ScanTransferSize) : ScanTransferSize;
    readPipe_->Read(*current);
    while (ReadMeasureDataInternal(*current, *next)) {
        std::swap(current, next);
    }
    if (Receiver() == nullptr) {
        scanData_.Resize(static_cast<std::size_t>(received_));
    }
}
TRACED

bool PellandoFunctionality_Win64::ReadMeasureDataInternal(CUsbIoBuffer& current, CUsbIoBuffer& next) try {
    next.NumberOfBytesToTransfer = ScanTransferSize;
    const std::uint64_t asked = received_ + current.NumberOfBytesToTransfer;
    if (IsFixedSize() && asked <= scanTotal_) {
        next.NumberOfBytesToTransfer =
            static_cast<std::uint32_t>(std::min<std::uint64_t>(scanTotal_ - asked, ScanTransferSize));
    }
    // Where it cannot be started, the wait for it will tell.
    readPipe_->Read(next);

    const std::uint32_t timeout = Receiver() != nullptr
                                      ? receiverLimit_
                                      : current.NumberOfBytesToTransfer / ScanRecordSize * ScanRecordTime +
                                            static_cast<std::uint32_t>(ReadGrace);
    const std::uint32_t status = readPipe_->WaitForCompletion(current, timeout);
    if (status != Status::Success && Receiver() != nullptr) {
        readPipe_->CancelToCompletion(current);
        TakeScanData(current);
    }
    ThrowIfUsbIoError(status, "WaitForCompletion1");
    TakeScanData(current);
    if (current.BytesTransferred > 0 && current.BytesTransferred >= current.NumberOfBytesToTransfer) {
        return true;
    }
    readPipe_->WaitForCompletion(next, 0);
    readPipe_->CancelIo();
    return false;
}
TRACED

void PellandoFunctionality_Win64::TakeScanData(const CUsbIoBuffer& buffer) {
    if (Receiver() == nullptr) {
        CopyDataToBufferInternal(buffer);
        return;
    }
    if (IsFixedSize() && buffer.BytesTransferred > scanTotal_ - received_) {
        throw DataException("more bytes read than expected", Here());
    }
    received_ += buffer.BytesTransferred;
    Receiver()->Receive({static_cast<const std::uint8_t*>(buffer.Buffer), buffer.BytesTransferred});
}

void PellandoFunctionality_Win64::CopyDataToBufferInternal(const CUsbIoBuffer& buffer) try {
    const std::uint32_t count = buffer.BytesTransferred;
    if (count == 0) {
        return;
    }
    const std::uint64_t end = received_ + count;
    if (scanData_.Capacity() < end) {
        if (IsFixedSize()) {
            throw DataException("buffer size is fix", Here());
        }
        scanData_.Reserve(std::max(std::uint64_t{scanData_.Size()} * 2, end));
    }
    if (scanData_.Size() < end) {
        if (IsFixedSize() || end > MaximumScanSize) {
            throw DataException("more bytes read than expected", Here());
        }
        scanData_.Resize(static_cast<std::size_t>(end));
    }
    std::memcpy(scanData_.Data() + received_, buffer.Buffer, count);
    received_ = end;
}
TRACED

void PellandoFunctionality_Win64::StartBeep() {
    const auto entry = [](void*) -> std::uint32_t {
        try {
            BeepTask();
        } catch (...) {  // a scan does without its beep
        }
        return 0;
    };
    const Platform::OwnedHandle thread(Platform::StartThread(entry, nullptr));
}

void PellandoFunctionality_Win64::BeepTask() try {
    Generic::Utilities::Timing::Instance()->DeviceDriverSleep(BeepDelay);
    Platform::Beep(Protocol::BeepFrequency, Protocol::BeepDuration);
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
