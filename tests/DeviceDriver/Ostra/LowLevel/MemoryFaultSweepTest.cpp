#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoRAM.h"
#include "FakeCommands.h"
#include "Protocol/EepromMap.h"

/// Every transfer of every operation on the memory fails once: what is left must be usable.
namespace Varnholt::DeviceDriver::Ostra::LowLevel {
namespace {

namespace EepromMap = Protocol::EepromMap;
using namespace Generic::Configuration;
using Generic::Utilities::IOException;

constexpr std::int32_t OldValue = 5;
constexpr std::int32_t NewValue = 6;

struct Area {
    std::uint32_t begin, size;
};
const std::vector<Area> LogAreas{{EepromMap::MainLog, EepromMap::LogSize},
                                 {EepromMap::LogCopy, EepromMap::LogSize}};

struct Operation {
    const char* name;
    std::function<void(PellandoEEPROM&)> run;
    std::vector<Area> written;
};

void ChangeLog(PellandoEEPROM& eeprom, int times) {
    for (int i = 0; i < times; ++i) {
        eeprom.SetProperty(10002, Property(NewValue));
    }
}

std::vector<Area> With(std::vector<Area> areas, const std::vector<Area>& more) {
    areas.insert(areas.end(), more.begin(), more.end());
    return areas;
}

const std::vector<Operation>& Operations() {
    static const std::vector<Operation> operations{
        {"construct and destroy", [](PellandoEEPROM&) {}, LogAreas},
        {"change the log and destroy", [](PellandoEEPROM& eeprom) { ChangeLog(eeprom, 1); }, LogAreas},
        {"dump the log",
         [](PellandoEEPROM& eeprom) {
             ChangeLog(eeprom, 1);
             eeprom.DumpLog();
         },
         LogAreas},
        {"store through",
         [](PellandoEEPROM& eeprom) {
             Properties set;
             set.SetProperty(10002, Property(NewValue));
             set.SetProperty(20001, Property(std::int32_t{1}));
             eeprom.Store(set);
         },
         LogAreas},
        {"change a log that is due", [](PellandoEEPROM& eeprom) { ChangeLog(eeprom, 21); }, LogAreas},
        {"dump an image with a log that is due",
         [](PellandoEEPROM& eeprom) {
             ChangeLog(eeprom, 20);
             eeprom.Dump();
         },
         LogAreas},
        {"store the binary block",
         [](PellandoEEPROM& eeprom) { eeprom.StoreBinary(10100, Bytes(EepromMap::BinarySize, 0x11)); },
         With(LogAreas, {{EepromMap::BinaryFirst, EepromMap::BinaryFirstSize},
                         {EepromMap::BinarySecond, EepromMap::BinarySecondSize}})},
        {"load the binary block", [](PellandoEEPROM& eeprom) { eeprom.LoadBinary(10100); }, LogAreas},
        {"store a word",
         [](PellandoEEPROM& eeprom) {
             eeprom.StoreBinary(10203, {1, 2, 3, 4});
         },
         With(LogAreas, {{EepromMap::RawWords + 12, 4}})},
    };
    return operations;
}

/// An image whose log holds `OldValue` in both copies, and something recognisable where nobody writes.
Bytes InitialImage() {
    FakeInstrument instrument;
    instrument.eeprom = FreshImage();
    PellandoEEPROM eeprom(Open(instrument));
    eeprom.SetProperty(10002, Property(OldValue));
    Bytes image = eeprom.Dump();
    for (std::size_t i = EepromMap::BinaryFirst; i < EepromMap::LogCopy; ++i) {
        image[i] = static_cast<std::uint8_t>(i);
    }
    return image;
}

/// Runs the operation on a new object and destroys it; true when a failure was told.
bool FailureOf(const Operation& operation, FakeInstrument& instrument) {
    bool failed = false;
    try {
        PellandoEEPROM eeprom(Open(instrument));
        eeprom.ReportLostLog([&](const std::string& reason) {
            failed = true;
            EXPECT_EQ(reason, "the fake fails");
        });
        operation.run(eeprom);
    } catch (const IOException& exception) {
        failed = true;
        EXPECT_STREQ(exception.what(), "the fake fails");
    }
    return failed;
}

bool IsWritten(const Operation& operation, std::size_t address) {
    for (const Area& area : operation.written) {
        if (address >= area.begin && address - area.begin < area.size) {
            return true;
        }
    }
    return false;
}

class MemoryFaultSweep : public testing::TestWithParam<std::size_t> {};

TEST_P(MemoryFaultSweep, LeavesAValidLogAndEverythingElseAsItWas) {
    const Operation& operation = Operations()[GetParam()];
    const Bytes initial = InitialImage();
    FakeInstrument instrument;
    instrument.eeprom = initial;
    ASSERT_FALSE(FailureOf(operation, instrument));
    const std::size_t transfers = instrument.commands.size();
    ASSERT_GE(transfers, 12U);
    for (std::size_t transfer = 0; transfer < transfers; ++transfer) {
        for (const std::uint32_t written : {0U, 7U, 256U}) {
            for (const bool isGone : {false, true}) {
                SCOPED_TRACE(testing::Message()
                             << operation.name << ", transfer " << transfer << " fails after " << written
                             << " bytes" << (isGone ? ", then all" : ""));
                FakeInstrument faulty;
                faulty.eeprom = initial;
                faulty.failingCommand = transfer;
                faulty.bytesWrittenByFailure = written;
                faulty.isGoneAfterFailure = isGone;
                EXPECT_TRUE(FailureOf(operation, faulty)) << "a failure must be told";
                for (std::size_t address = 0; address < initial.size(); ++address) {
                    if (faulty.eeprom[address] != initial[address] && !IsWritten(operation, address)) {
                        FAIL() << "address " << address << " has changed";
                    }
                }
                FakeInstrument next;
                next.eeprom = faulty.eeprom;
                PellandoEEPROM again(Open(next));
                const std::int32_t value = again.Load(10002).AsLong();
                EXPECT_TRUE(value == OldValue || value == NewValue)
                    << "no copy of the log was valid: " << value;
            }
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Operations, MemoryFaultSweep, testing::Range(std::size_t{0}, Operations().size()));

TEST(RamFaultSweep, StoringParametersPassesEveryFailureOnAndSendsNothingHalf) {
    FakeInstrument instrument;
    instrument.misc2 = 400;
    instrument.describeMode = [](std::uint8_t mode) {
        return std::array<std::uint8_t, 6>{3, mode, 0, static_cast<std::uint8_t>(40 - 10 * mode), 68, 1};
    };
    const auto store = [&] {
        PellandoRAM ram(Open(instrument));
        Properties loaded("PhysicalConditions");
        ram.Load(loaded);
        loaded.SetProperty(2009, Property(0.0008F));
        loaded.SetProperty(2001, Property(0.01F));
        ram.Store(loaded);
    };
    store();
    const std::size_t transfers = instrument.commands.size();
    ASSERT_EQ(transfers, 2U + 2U * 3U + 1U) << "loading, three modes, the parameters";
    for (std::size_t transfer = 0; transfer < transfers; ++transfer) {
        instrument.failingCommand = transfer;
        instrument.p1 = 4711;
        EXPECT_THROW(store(), IOException) << transfer;
        EXPECT_EQ(instrument.p1, 4711) << transfer;
    }
    instrument.failingCommand = ~std::size_t{0};
    store();
    EXPECT_EQ(instrument.p1, 12);
}

}  // namespace
}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
