// Every kind of operation of the library, on both transports, with every fault at every transfer: the outcome
// is a documented one, within a bounded time, and the instrument can be opened again.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <functional>
#include <iterator>
#include <numeric>
#include <optional>
#include <regex>
#include <span>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "FaultInjector.h"
#include "Operation.h"
#include "ostra.h"
#include "Protocol/Instrument.h"
#include "Support/SimulatedHost.h"
#include "Support/TestClock.h"
#include "TransferRecorder.h"

namespace Varnholt::Tests {
namespace {

using DeviceDriver::Generic::Utilities::DeviceDriverException;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality;
using Platform::Usb::TransferStatus;
using Simulator::Fault;
using Simulator::FaultKind;
using Simulator::FaultPlan;
using Simulator::RecordedTransfer;

constexpr std::uint32_t ScanRecord = 1000;
constexpr std::uint32_t ScanTotal = 100000;
constexpr std::uint64_t OpenScanTotal = 155'000;
/// Longest time-outs on the road: a transfer (15 s for a piece of the EEPROM), then a listener that is waited
/// for.
constexpr std::uint64_t TimeLimit = 40'000;  // ms

/// An operation on an opened instrument; other exceptions than the documented ones end the test.
std::function<Outcome()> OnInstrument(std::function<void(PellandoFunctionality&)> work) {
    return [work = std::move(work)]() -> Outcome {
        try {
            PellandoFunctionality instrument(nullptr, 0);
            work(instrument);
            return std::nullopt;
        } catch (const DeviceDriverException& exception) {
            return std::string(exception.what());
        }
    };
}

void RunScan(PellandoFunctionality& instrument, std::uint32_t total) {
    instrument.StartScan(ScanRecord, 1, total);
    std::vector<std::uint8_t> record(ScanRecord);
    for (std::uint32_t size = ScanRecord; size > 0;) {
        instrument.GetScanData(record.data(), size);
    }
}

const std::vector<std::uint8_t>& Image() {
    static const std::vector<std::uint8_t> image(OSTRA_IMAGE_SIZE, 0x5A);
    return image;
}

std::vector<Operation> CommandsAndExports() {
    using P = PellandoFunctionality;
    static std::array<std::uint8_t, Protocol::ReadoutBytes> readout;
    static std::uint8_t byte;
    static std::uint16_t word;
    return {
        {"MeasureRequest", OnInstrument([](P& i) { i.MeasureRequest(readout.data(), 256, 1); })},
        {"SetMeasureParameters", OnInstrument([](P& i) { i.SetMeasureParameters(1, 2, 3, 4); })},
        {"GetMISC", OnInstrument([](P& i) { i.GetMISC(byte, word, byte, word, word); })},
        {"WriteEEPROM", OnInstrument([](P& i) { i.WriteEEPROM(100, std::vector<std::uint8_t>(300)); })},
        {"ReadEEPROM", OnInstrument([](P& i) {
             std::vector<std::uint8_t> data(100);
             i.ReadEEPROM(0, data);
         })},
        {"FixedScan", OnInstrument([](P& i) { RunScan(i, ScanTotal); }), ScanTotal},
        {"OpenScan", OnInstrument([](P& i) { RunScan(i, 0); }), OpenScanTotal, true},
        {"ExportedReadout",
         []() -> Outcome {
             std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};
             const std::int32_t code = d4fb86cecc88582a(values.data(), "");
             EXPECT_TRUE(code == OSTRA_OK || code == OSTRA_FAILURE) << code;
             return code == OSTRA_OK ? Outcome() : Outcome(b5ae189db26b2a1b("LastError"));
         }},
        {"ExportedImageWrite",
         []() -> Outcome {
             const std::int32_t code = f3355d91d5df0e0b(Image().data(), "");
             EXPECT_TRUE(code == OSTRA_OK || code == OSTRA_UNKNOWN_FAILURE) << code;
             return code == OSTRA_OK ? Outcome() : Outcome(b5ae189db26b2a1b("LastError"));
         }},
    };
}

std::vector<Operation> Operations() {
    std::vector<Operation> all = CommandsAndExports();
    std::ranges::move(MemoryOperations(), std::back_inserter(all));
    return all;
}

/// Texts that a failure may have; the exports say nothing when the instrument could not be opened.
bool IsDocumented(Transport transport, const std::string& text) {
    static const std::regex native(
        "(Device IO control failed:? |(read|write) data failed|could not open pipe:|interrupt listener "
        "thread had timeout|"
        "Read data failed \\(|system busy\\. try again\\. Read data failed \\(|No devices connected|"
        "No such device connected)[^]*");
    static const std::regex usbio(
        "(Error in UsbIo function: \"\\w+\" Error: Error code 0x[0-9A-F]{8}: .+|No such device connected|"
        "requested device not found|interrupt listener thread had timeout)");
    static const std::regex memory(
        "corrupt EAT detected!!|id \\d+ doesn't exist|Integration time too (high|low)|"
        "Configuration data dump target too small");
    return text.empty() || std::regex_match(text, transport == Transport::Native ? native : usbio) ||
           std::regex_match(text, memory);
}

/// Whether an operation can end well although this fault hit this transfer.
bool MayGoUnnoticed(Transport transport, const Fault& fault, const RecordedTransfer& undisturbed,
                    bool openScan) {
    const bool control = undisturbed.endpoint == 0;
    if (undisturbed.endpoint == Protocol::InterruptInEndpoint ||
        undisturbed.status == TransferStatus::Cancelled) {
        return true;  // the button, or a read beyond the end of a scan
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
            return control || transport == Transport::UsbIo || undisturbed.length == 0 || openScan;
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

    Simulator::InstrumentSettings Settings() const {
        Simulator::InstrumentSettings settings;
        settings.scanBytes = operation_.scanBytes;
        return settings;
    }

    std::vector<RecordedTransfer> Undisturbed() const {
        const TestClock clock(TestTime::Virtual, 1);
        SimulatedHost host(transport_);
        host.Add("one", Settings());
        Simulator::TransferRecorder recorder;
        host.Bus().WrapDevices([&](const std::string&, auto device) { return recorder.Record(device); });
        EXPECT_EQ(operation_.run(), std::nullopt);
        return recorder.Transfers();
    }

    void RunWith(const FaultPlan& plan, const RecordedTransfer& undisturbed) const {
        SCOPED_TRACE(plan.Text());
        const Fault& fault = plan.Faults().front();
        const TestClock clock(TestTime::Virtual, fault.index + 1);
        const Stopwatch stopwatch(clock);
        SimulatedHost host(transport_);
        auto& instrument = host.Add("one", Settings());
        const auto script = std::make_shared<Simulator::FaultScript>(plan);
        host.Bus().WrapDevices([&](const std::string&, auto device) {
            return Simulator::InjectFaults(device, script, Platform::ClockScheduler(),
                                           [&] { instrument.Unplug(); });
        });
        if (operation_.check) {
            instrument.SetEeprom(operation_.eeprom);
        }
        const Outcome outcome = operation_.run();
        stopwatch.ExpectAtMost(TimeLimit);
        if (outcome) {
            EXPECT_TRUE(IsDocumented(transport_, *outcome)) << *outcome;
        } else if (script->Hits() > 0 && script->Transfers() > fault.index) {
            EXPECT_TRUE(MayGoUnnoticed(transport_, fault, undisturbed, operation_.endsWithShortTransfer))
                << "passed all the same";
        }
        EXPECT_EQ(instrument.PendingTransfers(), 0U);
        EXPECT_FALSE(instrument.Claimed());

        if (operation_.check) {
            operation_.check(instrument.Eeprom(), fault, undisturbed.endpoint);
            instrument.SetEeprom(operation_.eeprom);
        }

        // The next open works, or says that the device is gone.
        host.Bus().WrapDevices(nullptr);
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
    switch (kind) {
        case FaultKind::Late:
            return 20;
        case FaultKind::Flip:
            return 0;
        default:
            return std::nullopt;
    }
}

/// An instrument that never stops streaming makes an open-ended scan last for ever, as it should.
bool NeverEnds(const Operation& operation, const Fault& fault) {
    return operation.endsWithShortTransfer && fault.fromThenOn && fault.kind == FaultKind::Stale;
}

/// The same fault, counted among the transfers of its endpoint: where the system decides which thread is
/// first, the place among all differs from run to run.
Fault CountedByEndpoint(Fault fault, const std::vector<RecordedTransfer>& undisturbed) {
    const std::uint8_t endpoint = undisturbed[fault.index].endpoint;
    fault.scope = Simulator::ScopeOfEndpoint(endpoint);
    const std::span before(undisturbed.data(), fault.index);
    fault.index =
        static_cast<std::uint32_t>(std::ranges::count(before, endpoint, &RecordedTransfer::endpoint));
    return fault;
}

/// Every fault at every transfer of an operation that makes `count` of them.
std::vector<Fault> FaultsOver(const Operation& operation, std::size_t count) {
    std::vector<Fault> faults;
    // The pieces of a whole image are alike: the first and last ones stand for all, and samples between.
    for (std::size_t index = 0; index < count; index += (index > 12 && index + 12 < count) ? 11 : 1) {
        for (const auto& name : Simulator::AllFaults()) {
            for (const bool fromThenOn : {false, true}) {
                Fault fault;
                fault.index = static_cast<std::uint32_t>(index);
                fault.fromThenOn = fromThenOn;
                fault.kind = name.kind;
                fault.argument = ArgumentOf(name.kind);
                if (!NeverEnds(operation, fault)) {
                    faults.push_back(fault);
                }
            }
        }
    }
    return faults;
}

TEST_P(FaultSweep, EveryFaultAtEveryTransfer) {
    const std::vector<RecordedTransfer> undisturbed = Undisturbed();
    const std::vector<Fault> faults = FaultsOver(operation_, undisturbed.size());
    EXPECT_GT(faults.size(), 50U);
    // In real time there is time for some of them only: steps that go round through all spread what is tried.
    const bool inRealTime = !TestClock(TestTime::Virtual).IsVirtual();
    constexpr std::uint64_t RealTimeBudget = 1'500'000;
    const std::uint64_t begin = Platform::ClockScheduler().Now();
    std::size_t step = 1;
    while (inRealTime && (step < faults.size() / 3 || std::gcd(step, faults.size()) != 1)) {
        ++step;
    }
    std::size_t cases = 0;
    // One failure is enough to look into.
    while (cases < faults.size() && !HasFailure() &&
           !(inRealTime && Platform::ClockScheduler().Now() - begin > RealTimeBudget)) {
        const Fault& fault = faults[cases * step % faults.size()];
        RunWith(FaultPlan({inRealTime ? CountedByEndpoint(fault, undisturbed) : fault}),
                undisturbed[fault.index]);
        ++cases;
    }
    std::printf("%zu transfers, %zu of %zu cases\n", undisturbed.size(), cases, faults.size());
}

INSTANTIATE_TEST_SUITE_P(All, FaultSweep,
                         testing::Combine(testing::Values(Transport::Native, Transport::UsbIo),
                                          testing::Range<std::size_t>(0, Operations().size())),
                         [](const auto& parameter) {
                             return std::string(Name(std::get<0>(parameter.param))) + "_" +
                                    Operations()[std::get<1>(parameter.param)].name;
                         });

}  // namespace
}  // namespace Varnholt::Tests
