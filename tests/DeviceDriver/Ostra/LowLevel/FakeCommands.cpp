#include "FakeCommands.h"

#include <algorithm>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace EepromMap = Protocol::EepromMap;
using Generic::Utilities::IOException;
using Varnholt::Utilities::Exceptions::Here;
using Varnholt::Utilities::Tools::SmartPointer;

void PrintTo(const Command& command, std::ostream* stream) {
    *stream << command.name << "(" << command.address << ", " << command.size << ")";
}

std::vector<Command> FakeInstrument::TakeCommands() {
    return std::exchange(commands, {});
}

namespace {

std::uint16_t Number(const Bytes2& bytes) {
    return Protocol::LoadBig16(bytes.data());
}

class FakeCommands final : public PellandoFunctionalityByte {
  public:
    explicit FakeCommands(FakeInstrument& fake) : instrument_(fake) {}

    void SetMeasureParameters(const Bytes2& p1, const Bytes2& p2, const Bytes2& p3,
                              std::uint8_t p4) override {
        Receive("SetMeasureParameters");
        instrument_.p1 = Number(p1);
        instrument_.p2 = Number(p2);
        instrument_.p3 = Number(p3);
        instrument_.p4 = p4;
    }
    void GetMeasureParameters(Bytes2& p1, Bytes2& p2, Bytes2& p3, std::uint8_t& p4,
                              std::uint8_t& p5) override {
        Receive("GetMeasureParameters");
        Protocol::StoreBig16(p1.data(), instrument_.p1);
        Protocol::StoreBig16(p2.data(), instrument_.p2);
        Protocol::StoreBig16(p3.data(), instrument_.p3);
        p4 = instrument_.p4;
        p5 = instrument_.p5;
    }
    void SetMeasureMode(std::uint8_t mode) override {
        Receive("SetMeasureMode", mode);
        instrument_.mode = mode;
    }
    void GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3, std::uint8_t& m4,
                        std::uint8_t& m5, std::uint8_t& m6) override {
        Receive("GetMeasureMode");
        const auto answers = instrument_.describeMode(instrument_.mode);
        m1 = answers[0];
        m2 = answers[1];
        m3 = answers[2];
        m4 = answers[3];
        m5 = answers[4];
        m6 = answers[5];
    }
    void WriteEEPROM(const Bytes4& address, const Bytes2& length, const std::uint8_t* data,
                     std::uint32_t count) override {
        const std::uint32_t start = Protocol::LoadBig32(address.data());
        RefuseOutside(start, count, Number(length));
        Receive("WriteEEPROM", start, count);
        std::copy_n(data, count, instrument_.eeprom.begin() + static_cast<std::ptrdiff_t>(start));
    }
    void ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                    std::uint32_t count) override {
        const std::uint32_t start = Protocol::LoadBig32(address.data());
        RefuseOutside(start, count, Number(length));
        Receive("ReadEEPROM", start, count);
        std::copy_n(instrument_.eeprom.begin() + static_cast<std::ptrdiff_t>(start), count, data);
    }
    void GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4, Bytes2& m5) override {
        Receive("GetMISC");
        m1 = instrument_.misc1;
        Protocol::StoreBig16(m2.data(), instrument_.misc2);
        m3 = instrument_.misc3;
        Protocol::StoreBig16(m4.data(), instrument_.misc4);
        Protocol::StoreBig16(m5.data(), instrument_.misc5);
    }
    void Reset(const Bytes2& code) override { Receive("Reset", Number(code)); }
    void WriteCPLD(const Bytes2& c1, const Bytes2& c2, const Bytes2& c3) override {
        Receive("WriteCPLD");
        instrument_.cpld = {Number(c1), Number(c2), Number(c3)};
    }
    void ReadCPLD(Bytes2& value) override {
        Receive("ReadCPLD");
        Protocol::StoreBig16(value.data(), instrument_.cpld[0]);
    }
    void DownloadRAMFirmware(std::uint16_t address, const std::uint8_t*, std::uint32_t count) override {
        Receive("DownloadRAMFirmware", address, count);
    }
    void DownloadEEPROMFirmware(const Bytes4& address, const Bytes2& length, const std::uint8_t*,
                                std::uint32_t count) override {
        RefuseOutside(0, count, Number(length));
        Receive("DownloadEEPROMFirmware", Protocol::LoadBig32(address.data()), count);
    }
    void GetScanData(std::uint8_t* buffer, std::uint32_t* size) override {
        Receive("GetScanData", 0, *size);
        *size = std::min(*size, static_cast<std::uint32_t>(instrument_.scan.size()));
        std::copy_n(instrument_.scan.begin(), *size, buffer);
        instrument_.scan.erase(instrument_.scan.begin(),
                               instrument_.scan.begin() + static_cast<std::ptrdiff_t>(*size));
    }

    // What nobody asks it for.
    void RemoveListener(Generic::EventListener*) override {}
    void StartScan(std::uint32_t, std::uint32_t, std::uint32_t) override {}
    void MeasureRequest(std::uint8_t*, std::uint32_t, std::uint32_t) override {}
    void GetChipID(std::uint8_t*) override {}
    void GetDeviceIdentifier(std::string&) override {}

  private:
    void Receive(const char* name, std::uint32_t address = 0, std::uint32_t size = 0) {
        instrument_.commands.push_back({name, address, size});
        if (instrument_.commands.size() - 1 == instrument_.failingCommand) {
            throw IOException("the fake fails", Here());
        }
    }
    void RefuseOutside(std::uint32_t start, std::uint32_t count, std::uint32_t length) const {
        if (start > instrument_.eeprom.size() || count > instrument_.eeprom.size() - start ||
            count != length) {
            throw std::logic_error("EEPROM transfer outside the EEPROM");
        }
    }

    FakeInstrument& instrument_;
};

}  // namespace

SmartPointer<PellandoFunctionality> Open(FakeInstrument& instrument) {
    const SmartPointer<PellandoFunctionalityByte> transport(new FakeCommands(instrument));
    const SmartPointer<PellandoFunctionality> functionality(new PellandoFunctionality(transport));
    instrument.commands.clear();
    return functionality;
}

Bytes FreshImage() {
    PellandoEAT table;
    table.InitializeEmtpyEAT();
    Bytes image(Protocol::EepromSize, 0xFF);
    const auto at = [&image](std::ptrdiff_t address) { return image.begin() + address; };
    PellandoEAT::GetDefaultLogData().Dump(at(EepromMap::MainLog), image.end(), true, true);
    PellandoEAT::GetDefaultLogData().Dump(at(EepromMap::LogCopy), image.end(), true, true);
    table.Dump(at(EepromMap::Table), at(EepromMap::Calibration));
    PellandoEAT::GetDefaultCalibrationData().Dump(at(EepromMap::Calibration), image.end(), true, true);
    return image;
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
