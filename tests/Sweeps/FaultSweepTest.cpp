// The exports and the memory model, on both transports, with every fault at every transfer: the
// outcome is a documented one, within a bounded time, the instrument can be opened again, and whatever fails,
// a log is left in its memory and nothing else is touched.
#include <gmock/gmock.h>

#include <numeric>
#include <regex>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "FreshEeprom.h"
#include "ostra.h"
#include "Protocol/EepromMap.h"
#include "Service/Memory/ImageModel.h"
#include "Support/FaultText.h"
#include "Support/SimulatedHost.h"
#include "Support/TestClock.h"
#include "TransferRecorder.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::Tests {
namespace {

using DeviceDriver::Generic::Utilities::DeviceDriverException;
using namespace Simulator;
using namespace DeviceDriver::Generic::Configuration;
using namespace DeviceDriver::Ostra::LowLevel;
using Commands = Utilities::Tools::SmartPointer<PellandoFunctionality>;
namespace Map = Protocol::EepromMap;

/// What came out of one run: nothing, or the text of what failed.
using Outcome = std::optional<std::string>;
using Bytes = std::vector<std::uint8_t>;

struct Area {
    std::uint32_t first, size;
};

/// One operation of the library, to be run with faults.
struct Operation {
    const char* name;
    /// Opens the instrument, does its work, closes it.
    std::function<Outcome()> run;
    /// What may change in the EEPROM; empty: all of it.
    std::vector<Area> written = {};
};

/// Longest time-outs on the road: a transfer (15 s for a piece of the EEPROM), then a listener that is waited
/// for.
constexpr std::uint64_t TimeLimit = 40'000;  // ms

/// Ends with what was thrown.
std::function<Outcome()> Caught(std::function<void()> work) {
    return [work = std::move(work)]() -> Outcome {
        try {
            work();
        } catch (const Utilities::Exceptions::RuntimeException& exception) {
            return std::string(exception.what());
        }
        return std::nullopt;
    };
}

Outcome LastErrorUnless(bool isSuccess) {
    return isSuccess ? Outcome() : Outcome(b5ae189db26b2a1b("LastError"));
}

Outcome Readout() {
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};
    const std::int32_t code = d4fb86cecc88582a(values.data(), "");
    EXPECT_TRUE(code == OSTRA_OK || code == OSTRA_FAILURE) << code;
    return LastErrorUnless(code == OSTRA_OK);
}

Outcome ImageWrite() {
    const std::int32_t code = f3355d91d5df0e0b(Bytes(OSTRA_IMAGE_SIZE, 0x5A).data(), "");
    EXPECT_TRUE(code == OSTRA_OK || code == OSTRA_UNKNOWN_FAILURE) << code;
    return LastErrorUnless(code == OSTRA_OK);
}

/// The log filled, in both copies, and something recognisable where nobody writes.
Bytes UsedImage() {
    Service::ImageModel model(Simulator::FreshEeprom());
    std::vector<std::int32_t> ramp(128);
    std::iota(ramp.begin(), ramp.end(), 77'000);
    model.Get().SetProperty(10010, Property(ramp));
    model.Get().SetProperty(10011, Property(ramp));
    model.Get().DumpLog();
    Bytes image = model.Contents();
    for (std::uint32_t at = Map::BinaryFirst; at < Map::LogCopy; ++at) {
        image[at] = static_cast<std::uint8_t>(at);
    }
    return image;
}

/// Faults that change what arrives without anybody's notice.
bool ChangesData(FaultKind kind) {
    constexpr std::array kinds{FaultKind::Garbage, FaultKind::Flip, FaultKind::Stale, FaultKind::Short,
                               FaultKind::Empty};
    return std::ranges::find(kinds, kind) != kinds.end();
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
        const auto log = Service::ReadLogCopies(after);
        EXPECT_TRUE(log.main.isValid || log.second.isValid) << "no copy of the log is left";
    }
}

/// Called when all that is left is the end of a model, which writes the log and tells nobody what fails.
std::function<void()> beforeModelsEnd = [] {};

Operation OfModel(const char* name, std::function<void(PellandoEEPROM&)> work,
                  std::vector<Area> written = {}) {
    written.insert(written.end(), {{Map::MainLog, Map::LogSize}, {Map::LogCopy, Map::LogSize}});
    const auto onModel = [work = std::move(work)] {
        PellandoEEPROM eeprom(Commands(new PellandoFunctionality(nullptr, 0)));
        work(eeprom);
        beforeModelsEnd();
    };
    return {name, Caught(onModel), std::move(written)};
}

std::vector<Operation> Operations() {
    return {
        {"ExportedReadout", &Readout},
        {"ExportedImageWrite", &ImageWrite},
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
    };
}

/// Texts that a failure may have; the exports say nothing when the instrument could not be opened.
bool IsDocumented(Transport transport, const std::string& text) {
    static const std::regex native(
        "(Device IO control failed:? |(read|write) data failed|could not open pipe:|interrupt listener "
        "thread had timeout|No devices connected|No such device connected)[^]*");
    static const std::regex usbio(
        "(Error in UsbIo function: \"\\w+\" Error: Error code 0x[0-9A-F]{8}: .+|No such device connected|"
        "requested device not found|interrupt listener thread had timeout)");
    static const std::regex memory(
        "corrupt EAT detected!!|id \\d+ doesn't exist|Configuration data dump target too small");
    return text.empty() || std::regex_match(text, transport == Transport::Native ? native : usbio) ||
           std::regex_match(text, memory);
}

/// Whether an operation can end well although this fault hit this transfer.
bool MayGoUnnoticed(Transport transport, const Fault& fault, const RecordedTransfer& undisturbed) {
    const bool control = undisturbed.endpoint == 0;
    if (undisturbed.endpoint == Protocol::InterruptInEndpoint) {
        return true;  // the button
    }
    if (control && undisturbed.setup.request == static_cast<std::uint8_t>(Protocol::Request::ButtonReport)) {
        return true;  // sent while closing, not reported
    }
    switch (fault.kind) {
        case FaultKind::Stale:
        case FaultKind::Garbage:
        case FaultKind::Flip:
        case FaultKind::Late:
        case FaultKind::GoneAfter:
            return true;
        case FaultKind::Short:
        case FaultKind::Empty:
            return control || transport == Transport::UsbIo || undisturbed.length == 0;
        case FaultKind::Long:
            return undisturbed.length == 0;
        default:
            return false;
    }
}

class FaultSweep : public testing::TestWithParam<std::tuple<Transport, std::size_t>> {
  protected:
    const Transport transport_ = std::get<0>(GetParam());
    const Operation operation_ = Operations()[std::get<1>(GetParam())];
    const Bytes eeprom_ = UsedImage();

    std::size_t toldTransfers_ = SIZE_MAX;  ///< the first ones, of which a failure does not stay untold

    std::vector<RecordedTransfer> Undisturbed() {
        const TestClock clock(TestTime::Virtual, 1);
        SimulatedHost host(transport_);
        host.Add("struck");
        Simulator::TransferRecorder recorder;
        host.Bus().WrapDevices([&](const std::string&, auto device) { return recorder.Record(device); });
        beforeModelsEnd = [&] { toldTransfers_ = recorder.Count(); };
        EXPECT_EQ(operation_.run(), std::nullopt);
        beforeModelsEnd = [] {};
        return recorder.Transfers();
    }

    void RunWith(const Fault& fault, const RecordedTransfer& undisturbed, bool isTold) const {
        SCOPED_TRACE(FaultText(fault));
        const TestClock clock(TestTime::Virtual, fault.index + 1);
        const Stopwatch stopwatch(clock);
        SimulatedHost host(transport_);
        auto& instrument = host.Add("struck");
        const auto script = host.Bus().SetFaults("struck", FaultPlan({fault}));
        instrument.SetEeprom(eeprom_);
        const Outcome outcome = operation_.run();
        stopwatch.ExpectAtMost(TimeLimit);
        if (outcome) {
            EXPECT_TRUE(IsDocumented(transport_, *outcome)) << *outcome;
        } else if (script->Hits() > 0 && isTold) {
            EXPECT_TRUE(MayGoUnnoticed(transport_, fault, undisturbed)) << "passed all the same";
        }
        EXPECT_EQ(instrument.PendingTransfers(), 0U);
        EXPECT_FALSE(instrument.Claimed());

        if (!operation_.written.empty()) {
            CheckEeprom(eeprom_, operation_.written, instrument.Eeprom(), fault, undisturbed.endpoint);
        }
        instrument.SetEeprom(eeprom_);

        // The next open works, or says that the device is gone.
        host.Bus().SetFaults("struck", {});
        if (!instrument.PluggedIn()) {
            EXPECT_THROW(PellandoFunctionality(nullptr, 0), DeviceDriverException);
            instrument.PlugIn();
        }
        const Outcome next = operation_.run();
        EXPECT_EQ(next, std::nullopt) << *next;
    }
};

/// Faults that have a number, with one that every transfer notices.
std::optional<std::uint32_t> ArgumentOf(FaultKind kind) {
    return kind == FaultKind::Late   ? std::optional(20U)
           : kind == FaultKind::Flip ? std::optional(0U)
                                     : std::nullopt;
}

/// The same fault, counted among the transfers of its endpoint: where the system decides which thread is
/// first, the place among all differs from run to run.
Fault CountedByEndpoint(Fault fault, const std::vector<RecordedTransfer>& undisturbed) {
    const std::uint8_t endpoint = undisturbed[fault.index].endpoint;
    fault.endpoint = endpoint;
    const std::span before(undisturbed.data(), fault.index);
    fault.index =
        static_cast<std::uint32_t>(std::ranges::count(before, endpoint, &RecordedTransfer::endpoint));
    return fault;
}

/// Every fault at every transfer of an operation that makes `count` of them.
std::vector<Fault> FaultsOver(std::size_t count) {
    std::vector<Fault> faults;
    // The pieces of a whole image are alike: the first and last ones stand for all, and samples between.
    for (std::size_t index = 0; index < count; index += (index > 12 && index + 12 < count) ? 11 : 1) {
        for (const auto& name : Simulator::AllFaults()) {
            for (const bool fromThenOn : {false, true}) {
                faults.push_back({std::nullopt, static_cast<std::uint32_t>(index), fromThenOn, name.kind,
                                  ArgumentOf(name.kind)});
            }
        }
    }
    return faults;
}

TEST_P(FaultSweep, EveryFaultAtEveryTransfer) {
    const std::vector<RecordedTransfer> undisturbed = Undisturbed();
    const std::vector<Fault> faults = FaultsOver(undisturbed.size());
    EXPECT_GT(faults.size(), 50U);
    // In real time, and where memory is checked, there is time for some of them only: steps that go round
    // through all spread what is tried.
    const bool inRealTime = !TestClock(TestTime::Virtual).IsVirtual();
    constexpr std::uint64_t RealTimeBudget = 500'000;
    const std::uint64_t begin = Platform::ClockScheduler().Now();
    std::size_t step = 1;
    const bool areSome = inRealTime || OSTRA_SWEEP_STEP > 1;
    while (areSome && (step < faults.size() / 3 || std::gcd(step, faults.size()) != 1)) {
        ++step;
    }
    std::size_t cases = 0;
    // One failure is enough to look into.
    while (cases < faults.size() / OSTRA_SWEEP_STEP && !HasFailure() &&
           !(inRealTime && Platform::ClockScheduler().Now() - begin > RealTimeBudget)) {
        const Fault& fault = faults[cases * step % faults.size()];
        RunWith(inRealTime ? CountedByEndpoint(fault, undisturbed) : fault, undisturbed[fault.index],
                fault.index < toldTransfers_);
        ++cases;
    }
    std::printf("%zu transfers, %zu of %zu cases\n", undisturbed.size(), cases, faults.size());
}

OSTRA_SWEEP_BOTH_TRANSPORTS(FaultSweep, Operations());

}  // namespace
}  // namespace Varnholt::Tests
