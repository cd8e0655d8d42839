#include <gtest/gtest.h>

#include <algorithm>
#include <utility>

#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoRAM.h"
#include "FreshEeprom.h"
#include "Operation.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::Tests {
namespace {

using namespace DeviceDriver::Generic::Configuration;
using namespace DeviceDriver::Ostra::LowLevel;
using Simulator::Fault;
using Simulator::FaultKind;
using Commands = Utilities::Tools::SmartPointer<PellandoFunctionality>;
namespace Map = Protocol::EepromMap;

struct Area {
    std::uint32_t first, size;
};

std::uint32_t WordAt(const Bytes& image, std::uint32_t address) {
    return Protocol::LoadBig32(&image[address]);
}

/// The checksum is the first word of a copy and the sum of all others.
std::uint32_t ChecksumOf(const Bytes& image, std::uint32_t copy) {
    std::uint32_t sum = 0;
    for (std::uint32_t at = 4; at < Map::LogSize; at += 4) {
        sum += WordAt(image, copy + at);
    }
    return sum;
}

bool HasValidLog(const Bytes& image, std::uint32_t copy) {
    return WordAt(image, copy) == ChecksumOf(image, copy);
}

/// Both logs filled, and something recognisable where nobody writes.
Bytes UsedImage() {
    Bytes image = Simulator::FreshEeprom();
    for (const std::uint32_t copy : {Map::MainLog, Map::LogCopy}) {
        for (std::uint32_t at = 4; at < Map::LogSize; at += 4) {
            Protocol::StoreBig32(&image[copy + at], at * at);
        }
        Protocol::StoreBig32(&image[copy], ChecksumOf(image, copy));
    }
    for (std::uint32_t at = Map::BinaryFirst; at < Map::LogCopy; ++at) {
        image[at] = static_cast<std::uint8_t>(at);
    }
    return image;
}

/// Faults that change what arrives without anybody's notice.
bool ChangesData(FaultKind kind) {
    switch (kind) {
        case FaultKind::Garbage:
        case FaultKind::Flip:
        case FaultKind::Stale:
        case FaultKind::Short:
        case FaultKind::Empty:
            return true;
        default:
            return false;
    }
}

void CheckEeprom(const Bytes& before, const std::vector<Area>& written, const Bytes& after,
                 const Fault& fault, std::uint8_t endpoint) {
    if (endpoint == 0 && ChangesData(fault.kind)) {
        return;  // an address that has changed on its way leads anywhere
    }
    for (std::uint32_t at = 0; at < after.size(); ++at) {
        const bool mayChange = std::ranges::any_of(
            written, [at](const Area& area) { return at >= area.first && at - area.first < area.size; });
        if (after[at] != before[at] && !mayChange) {
            ADD_FAILURE() << "address " << at << " has changed";
            return;
        }
    }
    if (!(fault.fromThenOn && ChangesData(fault.kind))) {
        EXPECT_TRUE(HasValidLog(after, Map::MainLog) || HasValidLog(after, Map::LogCopy))
            << "no copy of the log is left";
    }
}

/// Ends with what was thrown, or with why the log was lost.
std::function<Outcome()> Caught(std::function<void(Outcome& lost)> work) {
    return [work = std::move(work)]() -> Outcome {
        Outcome lost;
        try {
            work(lost);
        } catch (const Utilities::Exceptions::TraceableException& exception) {
            return std::string(exception.what());
        }
        return lost;
    };
}

void StoreParameters(Outcome&) {
    PellandoRAM ram(Commands(new PellandoFunctionality(nullptr, 0)));
    Properties set("PhysicalConditions");
    ram.Load(set);
    set.SetProperty(2009, Property(0.005F));
    ram.Store(set);
}

Operation Checked(const char* name, std::function<Outcome()> run, std::vector<Area> written) {
    Operation operation{name, std::move(run)};
    operation.eeprom = UsedImage();
    operation.check = [before = operation.eeprom, written = std::move(written)](
                          const Bytes& after, const Fault& fault, std::uint8_t endpoint) {
        CheckEeprom(before, written, after, fault, endpoint);
    };
    return operation;
}

Operation OfModel(const char* name, std::function<void(PellandoEEPROM&)> work,
                  const std::vector<Area>& written = {}) {
    std::vector<Area> all = written;
    all.insert(all.end(), {{Map::MainLog, Map::LogSize}, {Map::LogCopy, Map::LogSize}});
    const auto onModel = [work = std::move(work)](Outcome& lost) {
        PellandoEEPROM eeprom(Commands(new PellandoFunctionality(nullptr, 0)));
        eeprom.ReportLostLog([&lost](const std::string& reason) { lost = reason; });
        work(eeprom);
    };
    return Checked(name, Caught(onModel), std::move(all));
}

}  // namespace

std::vector<Operation> MemoryOperations() {
    return {
        OfModel("ModelAndItsEnd", [](PellandoEEPROM&) {}),
        OfModel("ModelStore",
                [](PellandoEEPROM& eeprom) {
                    Properties set;
                    set.SetProperty(10002, Property(std::int32_t{6}));
                    set.SetProperty(10021, Property(std::int32_t{7}));  // in another piece than the checksum
                    set.SetProperty(20001, Property(std::int32_t{1}));
                    eeprom.Store(set);
                }),
        OfModel("ModelDump",
                [](PellandoEEPROM& eeprom) {
                    for (int i = 0; i < 20; ++i) {
                        eeprom.SetProperty(10002, Property(std::int32_t{i}));
                    }
                    eeprom.Dump();
                }),
        OfModel("ModelBinary",
                [](PellandoEEPROM& eeprom) {
                    eeprom.StoreBinary(10100, Bytes(Map::BinarySize, 0x11));
                    eeprom.StoreBinary(10203, {1, 2, 3, 4});
                    eeprom.LoadBinary(10100);
                },
                {{Map::BinaryFirst, Map::BinaryFirstSize},
                 {Map::BinarySecond, Map::BinarySecondSize},
                 {Map::RawWords + 3 * Map::RawWordSize, Map::RawWordSize}}),
        Checked("RamStore", Caught(&StoreParameters), {}),
    };
}

}  // namespace Varnholt::Tests
