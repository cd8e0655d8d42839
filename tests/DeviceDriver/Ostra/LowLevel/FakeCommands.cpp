#include "FakeCommands.h"

#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Protocol/ByteOrder.h"
#include "Service/Memory/ImageTransport.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Generic::Utilities::IOException;
using Varnholt::Utilities::Exceptions::Here;
using Varnholt::Utilities::Tools::SmartPointer;

std::string FakeInstrument::TakeCommands() {
    std::string text;
    for (const std::string& command : std::exchange(commands, {})) {
        text += (text.empty() ? "" : " ") + command;
    }
    return text;
}

namespace {

std::uint16_t Number(const Bytes2& bytes) {
    return Protocol::LoadBig16(bytes.data());
}

class FakeCommands final : public Service::ImageTransport {
  public:
    explicit FakeCommands(FakeInstrument& fake) : ImageTransport(fake.eeprom), instrument_(fake) {}

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
        Receive("SetMeasureMode");
        instrument_.mode = mode;
    }
    void GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3, std::uint8_t& m4,
                        std::uint8_t& m5, std::uint8_t& m6) override {
        Receive("GetMeasureMode");
        const auto answers = instrument_.describeMode(instrument_.mode);
        std::size_t next = 0;
        for (std::uint8_t* const value : {&m1, &m2, &m3, &m4, &m5, &m6}) {
            *value = answers[next++];
        }
    }
    void WriteEEPROM(const Bytes4& address, const Bytes2& length, const std::uint8_t* data,
                     std::uint32_t count) override {
        Receive("write ", address, length);
        ImageTransport::WriteEEPROM(address, length, data, count);
    }
    void ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                    std::uint32_t count) override {
        Receive("read ", address, length);
        ImageTransport::ReadEEPROM(address, length, data, count - instrument_.missing);
    }
    void GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4, Bytes2& m5) override {
        Receive("GetMISC");
        m1 = instrument_.misc1;
        Protocol::StoreBig16(m2.data(), instrument_.misc2);
        m3 = instrument_.misc3;
        Protocol::StoreBig16(m4.data(), instrument_.misc4);
        Protocol::StoreBig16(m5.data(), instrument_.misc5);
    }
    void Reset(const Bytes2&) override { Receive("Reset"); }

  private:
    void Receive(const std::string& command) {
        instrument_.commands.push_back(command);
        if (instrument_.commands.size() - 1 == instrument_.failingCommand) {
            throw IOException("the fake fails", Here());
        }
    }
    void Receive(const std::string& name, const Bytes4& address, const Bytes2& length) {
        Receive(name + std::to_string(Protocol::LoadBig32(address.data())) + "+" +
                std::to_string(Number(length)));
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

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
