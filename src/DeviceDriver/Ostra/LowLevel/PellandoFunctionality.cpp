#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"

#include <algorithm>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Generic/Utilities/EndianConversion.h"
#include "Protocol/Instrument.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

using Varnholt::Utilities::Exceptions::InvalidArgumentException;
namespace EndianConversion = Generic::Utilities::EndianConversion;

Bytes2 ToBytes(std::uint16_t value) {
    Bytes2 bytes;
    EndianConversion::ShortToByteArray(value, bytes.data(), true);
    return bytes;
}

Bytes4 ToBytes(std::uint32_t value) {
    Bytes4 bytes;
    EndianConversion::LongToByteArray(value, bytes.data(), true);
    return bytes;
}

void FromBytes(const Bytes2& bytes, std::uint16_t& value) {
    EndianConversion::ByteArrayToShort(bytes.data(), value, true);
}

/// The lengths of commands are 16-bit numbers; what does not fit would reach the instrument truncated.
std::uint16_t CheckedLength(std::size_t length) {
    if (length == 0 || length > 0xFFFF) {
        throw InvalidArgumentException("data of 1 to 65535 bytes expected", Here());
    }
    return static_cast<std::uint16_t>(length);
}

}  // namespace

PellandoFunctionality::PellandoFunctionality(Generic::EventListener* listener, std::uint32_t deviceIndex) try
    : implementation_(PellandoFunctionalityByte::Instance(listener, deviceIndex)) {
    Reset(Protocol::OpeningResetCode);
}
TRACED

PellandoFunctionality::PellandoFunctionality(
    const Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionalityByte>& transport) try
    : implementation_(transport) {
    Reset(Protocol::OpeningResetCode);
}
TRACED

void PellandoFunctionality::removeListener(Generic::EventListener* listener) try {
    implementation_->RemoveListener(listener);
}
TRACED

void PellandoFunctionality::SetScanReceiver(ScanReceiver* receiver) try {
    implementation_->SetScanReceiver(receiver);
}
TRACED

void PellandoFunctionality::MeasureRequest(std::uint8_t* buffer, std::uint32_t length,
                                           std::uint32_t timeoutSeconds) try {
    implementation_->MeasureRequest(buffer, length, timeoutSeconds);
}
TRACED

void PellandoFunctionality::SetMeasureParameters(std::uint16_t p1, std::uint16_t p2, std::uint16_t p3,
                                                 std::uint8_t p4) try {
    implementation_->SetMeasureParameters(ToBytes(p1), ToBytes(p2), ToBytes(p3), p4);
}
TRACED

void PellandoFunctionality::GetMeasureParameters(std::uint16_t& p1, std::uint16_t& p2, std::uint16_t& p3,
                                                 std::uint8_t& p4, std::uint8_t& p5) try {
    Bytes2 bytes1{}, bytes2{}, bytes3{};
    implementation_->GetMeasureParameters(bytes1, bytes2, bytes3, p4, p5);
    FromBytes(bytes1, p1);
    FromBytes(bytes2, p2);
    FromBytes(bytes3, p3);
}
TRACED

void PellandoFunctionality::SetMeasureMode(std::uint8_t mode) try { implementation_->SetMeasureMode(mode); }
TRACED

void PellandoFunctionality::GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3,
                                           std::uint8_t& m4, std::uint8_t& m5, std::uint8_t& m6) try {
    implementation_->GetMeasureMode(m1, m2, m3, m4, m5, m6);
}
TRACED

void PellandoFunctionality::WriteEEPROM(std::uint32_t address, const std::vector<std::uint8_t>& data) try {
    for (std::size_t offset = 0; offset < data.size(); offset += Protocol::EepromWritePiece) {
        const auto length = static_cast<std::uint16_t>(
            std::min<std::size_t>(data.size() - offset, Protocol::EepromWritePiece));
        implementation_->WriteEEPROM(ToBytes(address + static_cast<std::uint32_t>(offset)), ToBytes(length),
                                     data.data() + offset, length);
    }
}
TRACED

void PellandoFunctionality::ReadEEPROM(std::uint32_t address, std::vector<std::uint8_t>& data) try {
    const std::size_t wanted = data.size();
    const std::size_t beyondUnit = wanted % Protocol::EepromReadUnit;
    const std::size_t padded = beyondUnit == 0 ? wanted : wanted + Protocol::EepromReadUnit - beyondUnit;
    const std::uint16_t length = CheckedLength(padded);
    data.resize(padded);
    try {
        implementation_->ReadEEPROM(ToBytes(address), ToBytes(length), data.data(), length);
    } catch (...) {
        data.resize(wanted);
        throw;
    }
    data.resize(wanted);
}
TRACED

void PellandoFunctionality::WriteCPLD(std::uint16_t c1, std::uint16_t c2, std::uint16_t c3) try {
    implementation_->WriteCPLD(ToBytes(c1), ToBytes(c2), ToBytes(c3));
}
TRACED

void PellandoFunctionality::ReadCPLD(std::uint16_t& value) try {
    Bytes2 bytes{};
    implementation_->ReadCPLD(bytes);
    FromBytes(bytes, value);
}
TRACED

void PellandoFunctionality::DownloadFirmware(std::uint16_t address, const std::vector<std::uint8_t>& image,
                                             bool toEEPROM) try {
    const std::uint16_t length = CheckedLength(image.size());
    if (toEEPROM) {
        implementation_->DownloadEEPROMFirmware(ToBytes(std::uint32_t{address}), ToBytes(length),
                                                image.data(), length);
    } else {
        implementation_->DownloadRAMFirmware(address, image.data(), length);
    }
}
TRACED

void PellandoFunctionality::GetMISC(std::uint8_t& m1, std::uint16_t& m2, std::uint8_t& m3, std::uint16_t& m4,
                                    std::uint16_t& m5) try {
    Bytes2 bytes2{}, bytes4{}, bytes5{};
    implementation_->GetMISC(m1, bytes2, m3, bytes4, bytes5);
    FromBytes(bytes2, m2);
    FromBytes(bytes4, m4);
    FromBytes(bytes5, m5);
}
TRACED

void PellandoFunctionality::GetDeviceIdentifier(std::string& identifier) try {
    implementation_->GetDeviceIdentifier(identifier);
}
TRACED

void PellandoFunctionality::Reset(std::uint16_t code) try { implementation_->Reset(ToBytes(code)); }
TRACED

void PellandoFunctionality::StartScan(std::uint32_t recordSize, std::uint32_t timeoutSeconds,
                                      std::uint32_t total) try {
    implementation_->StartScan(recordSize, timeoutSeconds, total);
}
TRACED

void PellandoFunctionality::GetScanData(std::uint8_t* buffer, std::uint32_t& size) try {
    implementation_->GetScanData(buffer, &size);
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
