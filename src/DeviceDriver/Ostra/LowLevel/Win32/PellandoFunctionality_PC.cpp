#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoFunctionality_PC.h"

#include <algorithm>
#include <cstring>
#include <span>
#include <vector>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/WaitLimit.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "Platform/ErrorCodes.h"
#include "Platform/ScopedThreadPriority.h"
#include "Protocol/ByteOrder.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace DataStage = Protocol::DataStage;
namespace NativeDriver = Protocol::NativeDriver;
using Protocol::Request;

namespace {

std::uint32_t SecondsLimit(std::uint32_t seconds) {
    return WaitLimit(std::uint64_t{seconds} * 1000);
}

}  // namespace

PellandoFunctionality_PC::PellandoFunctionality_PC(Generic::EventListener* listener,
                                                   std::uint32_t deviceIndex) try
    : device_(new PellandoUSBDevice(listener, GetDeviceAddress(deviceIndex))) {
    record_.block[NativeDriver::Block::Type] = NativeDriver::TypeVendor;
    record_.block[NativeDriver::Block::Request] = static_cast<std::uint8_t>(Request::Measure);
}
TRACED

PellandoFunctionality_PC::~PellandoFunctionality_PC() = default;

std::string PellandoFunctionality_PC::GetDeviceAddress(std::uint32_t deviceIndex) try {
    const std::vector<std::string> paths = PellandoUSBDevice::GetAllDevices();
    if (paths.empty()) {
        throw IOException("No devices connected", Here(), Platform::Errors::FileNotFound);
    }
    if (deviceIndex >= paths.size()) {
        throw IOException("No such device connected", Here(), Platform::Errors::FileNotFound);
    }
    return paths[deviceIndex];
}
TRACED

void PellandoFunctionality_PC::Transfer(Request request, std::uint8_t direction, void* data,
                                        std::uint32_t length) {
    record_.block[NativeDriver::Block::Direction] = direction;
    record_.block[NativeDriver::Block::Request] = static_cast<std::uint8_t>(request);
    const std::uint32_t moved = device_->PerformDeviceIOControl(record_.block, data, length);
    // A driver need not say how much it sent: what an instrument is sent it takes as a whole or refuses.
    if (moved > 0 || direction == NativeDriver::DirectionIn) {
        DataStageEnded(length, moved);
    }
}

void PellandoFunctionality_PC::Send(Request request, std::uint32_t length) {
    Transfer(request, NativeDriver::DirectionOut, record_.data.data(), length);
}

void PellandoFunctionality_PC::Receive(Request request, std::uint32_t length) {
    Transfer(request, NativeDriver::DirectionIn, record_.data.data(), length);
}

template <std::size_t Size>
void PellandoFunctionality_PC::Put(std::size_t offset, const std::array<std::uint8_t, Size>& bytes) {
    std::copy(bytes.begin(), bytes.end(), record_.data.begin() + static_cast<std::ptrdiff_t>(offset));
}

template <std::size_t Size>
void PellandoFunctionality_PC::Take(std::size_t offset, std::array<std::uint8_t, Size>& bytes) const {
    std::copy_n(record_.data.begin() + static_cast<std::ptrdiff_t>(offset), Size, bytes.begin());
}

void PellandoFunctionality_PC::RemoveListener(Generic::EventListener* listener) try {
    device_->RemoveListener(listener);
}
TRACED

void PellandoFunctionality_PC::StartScan(std::uint32_t recordSize, std::uint32_t timeoutSeconds,
                                         std::uint32_t total) try {
    scanRecords_.clear();
    Send(Request::Measure, 0);
    try {
        ReadStrip(recordSize, SecondsLimit(timeoutSeconds), total);
    } catch (...) {
        scanRecords_.clear();
        throw;
    }
}
TRACED

void PellandoFunctionality_PC::ReadStrip(std::uint32_t recordSize, std::uint32_t timeout,
                                         std::uint32_t total) {
    // A strip read must have its next read queued in time: its thread goes before others while it runs.
    const Platform::ScopedThreadPriority raised(Platform::HighestThreadPriority);
    const auto readInto = [&](auto& target) {
        total != 0 ? device_->ReadDataCountedStrip(target, recordSize, timeout, total)
                   : device_->ReadDataStrip(target, recordSize, timeout);
    };
    Receiver() != nullptr ? readInto(*Receiver()) : readInto(scanRecords_);
}

void PellandoFunctionality_PC::GetScanData(std::uint8_t* buffer, std::uint32_t* size) try {
    if (scanRecords_.empty()) {
        *size = 0;
        return;
    }
    const std::span<const std::uint8_t> bytes = scanRecords_.front().Bytes();
    *size = std::min(*size, static_cast<std::uint32_t>(bytes.size()));
    std::memcpy(buffer, bytes.data(), *size);
    scanRecords_.pop_front();
}
TRACED

void PellandoFunctionality_PC::MeasureRequest(std::uint8_t* buffer, std::uint32_t length,
                                              std::uint32_t timeoutSeconds) try {
    Send(Request::Measure, 0);
    device_->ReadData(buffer, length, SecondsLimit(timeoutSeconds));
}
TRACED

void PellandoFunctionality_PC::SetMeasureParameters(const Bytes2& p1, const Bytes2& p2, const Bytes2& p3,
                                                    std::uint8_t p4) try {
    Put(DataStage::P1, p1);
    Put(DataStage::P2, p2);
    Put(DataStage::P3, p3);
    record_.data[DataStage::P4] = p4;
    Send(Request::SetMeasureParameters, DataStage::MeasureParametersSize);
}
TRACED

void PellandoFunctionality_PC::GetMeasureParameters(Bytes2& p1, Bytes2& p2, Bytes2& p3, std::uint8_t& p4,
                                                    std::uint8_t& p5) try {
    Receive(Request::GetMeasureParameters, DataStage::MeasureParametersSize);
    Take(DataStage::P1, p1);
    Take(DataStage::P2, p2);
    Take(DataStage::P3, p3);
    p4 = record_.data[DataStage::P4];
    p5 = record_.data[DataStage::P5];
}
TRACED

void PellandoFunctionality_PC::SetMeasureMode(std::uint8_t mode) try {
    record_.data[0] = mode;
    Send(Request::SetMeasureMode, DataStage::SetModeSize);
}
TRACED

void PellandoFunctionality_PC::GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3,
                                              std::uint8_t& m4, std::uint8_t& m5, std::uint8_t& m6) try {
    Receive(Request::GetMeasureMode, DataStage::MeasureModeSize);
    m1 = record_.data[0];
    m2 = record_.data[1];
    m3 = record_.data[2];
    m4 = record_.data[3];
    m5 = record_.data[4];
    m6 = record_.data[5];
}
TRACED

void PellandoFunctionality_PC::WriteEEPROM(const Bytes4& address, const Bytes2& length,
                                           const std::uint8_t* data, std::uint32_t count) try {
    WriteEEPROM(Request::WriteEeprom, address, length, data, count);
}
TRACED

void PellandoFunctionality_PC::WriteEEPROM(Request request, const Bytes4& address, const Bytes2& length,
                                           const std::uint8_t* data, std::uint32_t count) try {
    Put(DataStage::Address, address);
    Put(DataStage::Length, length);
    Send(request, DataStage::MemoryRequestSize);
    device_->WriteData(data, count, WaitLimit(std::uint64_t{count} * 10));
    const std::uint8_t end = 0x00;
    device_->WriteData(&end, sizeof end, 0);
    device_->WriteData(&end, sizeof end, 0);
}
TRACED

void PellandoFunctionality_PC::ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                                          std::uint32_t count) try {
    Put(DataStage::Address, address);
    Put(DataStage::Length, length);
    Send(Request::ReadEeprom, DataStage::MemoryRequestSize);
    device_->ReadData(data, count, WaitLimit(count));
}
TRACED

void PellandoFunctionality_PC::WriteCPLD(const Bytes2& c1, const Bytes2& c2, const Bytes2& c3) try {
    Put(DataStage::C1, c1);
    Put(DataStage::C2, c2);
    Put(DataStage::C3, c3);
    Send(Request::WriteCpld, DataStage::WriteCpldSize);
}
TRACED

void PellandoFunctionality_PC::ReadCPLD(Bytes2& value) try {
    Receive(Request::ReadCpld, DataStage::ReadCpldSize);
    Take(0, value);
}
TRACED

void PellandoFunctionality_PC::DownloadRAMFirmware(std::uint16_t address, const std::uint8_t* image,
                                                   std::uint32_t count) try {
    Protocol::StoreLittle16(&record_.block[NativeDriver::Block::Value], address);
    // The driver only reads the data of a request in this direction.
    Transfer(Request::DownloadRamFirmware, NativeDriver::DirectionOut, const_cast<std::uint8_t*>(image),
             count);
}
TRACED

void PellandoFunctionality_PC::DownloadEEPROMFirmware(const Bytes4& address, const Bytes2& length,
                                                      const std::uint8_t* image, std::uint32_t count) try {
    WriteEEPROM(Request::DownloadEepromFirmware, address, length, image, count);
}
TRACED

void PellandoFunctionality_PC::GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4,
                                       Bytes2& m5) try {
    Receive(Request::GetMisc, DataStage::MiscSize);
    Take(DataStage::M2, m2);
    Take(DataStage::M4, m4);
    Take(DataStage::M5, m5);
    m1 = record_.data[DataStage::M1];
    m3 = record_.data[DataStage::M3];
}
TRACED

void PellandoFunctionality_PC::GetChipID(std::uint8_t* id) try {
    Transfer(Request::GetChipId, NativeDriver::DirectionIn, id, DataStage::ChipIdSize);
}
TRACED

void PellandoFunctionality_PC::Reset(const Bytes2& code) try {
    // The code's low byte; the second byte of the data area gets it as well and is not sent.
    record_.data[0] = code[1];
    record_.data[1] = code[1];
    Send(Request::Reset, DataStage::ResetSize);
}
TRACED

void PellandoFunctionality_PC::GetDeviceIdentifier(std::string& identifier) try {
    identifier = device_->GetAddress();
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
