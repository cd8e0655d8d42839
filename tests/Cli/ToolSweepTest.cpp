// Every command that talks to an instrument, on both transports, with every fault at every transfer: it
// succeeds with the result that it has without the fault, or it fails with its exit code, tells what to do,
// and has lost nothing.
#include <cstdio>
#include <map>

#include "Protocol/PropertyIdentifiers.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"
#include "Support/FaultText.h"
#include "ToolFixture.h"

namespace Varnholt::Tests {
namespace {

using Cli::ExitCode;
using namespace Simulator;
using Bytes = std::vector<std::uint8_t>;
using Files = std::map<std::string, Bytes>;

constexpr const char* Instrument = "swept";
constexpr std::uint32_t RecordSize = 5000;
constexpr std::uint8_t ControlEndpoint = 0;

/// What the data of a command are protected by.
enum class Data {
    Checked,     ///< memory: read twice, and once more when it was written
    Trusted,     ///< read or sent once, without a check that the instrument offers: wrong bytes are not seen
    TrustedOpen  ///< of a scan, besides, that lasts until a transfer comes short
};

struct Command {
    const char* name;
    const char* line;
    Data data;
    const char* recording = nullptr;  ///< of records of `RecordSize` bytes
    bool showsEvents = false;         ///< a removal is one, and a success
};

constexpr Command Commands[] = {
    {"ListChipIds", "list --chip-id", Data::Trusted},
    {"IdentifyChip", "identify --device chip:5a0123456789abcd", Data::Trusted},
    {"Reset", "reset", Data::Trusted},
    {"Readout", "readout", Data::Trusted},
    {"ReadoutInTime", "readout --integration-time 0.01", Data::Trusted},
    {"Scan", "scan --record-size 5000 --records 30 --timeout 1 --raw -o @scan", Data::Trusted, "scan"},
    {"OpenScan", "scan --record-size 5000 --timeout 1 --raw -o @scan", Data::TrustedOpen, "scan"},
    {"Monitor", "monitor --for 0.1", Data::Trusted, nullptr, true},
    {"Backup", "eeprom backup @new", Data::Checked},
    {"Show", "eeprom show", Data::Checked},
    {"Check", "eeprom check", Data::Checked},
    {"Diff", "eeprom diff @image", Data::Checked},
    {"Write", "eeprom write @image --backup @backup", Data::Checked},
    {"Restore", "eeprom restore @image", Data::Checked},
    {"WriteImage", "write-image @image", Data::Checked},
    {"CalibrationShow", "calibration show", Data::Checked},
    {"CalibrationSet", "calibration set 1211=5 --backup @backup", Data::Checked},
    {"LogShow", "log show", Data::Checked},
    {"LogReset", "log reset --backup @backup", Data::Checked},
    {"BinaryGet", "binary get @new", Data::Checked},
    {"BinaryPut", "binary put @block --backup @backup", Data::Checked},
    {"WordGet", "word get 10200", Data::Checked},
    {"WordPut", "word put 10200=7 --backup @backup", Data::Checked},
    {"RamShow", "ram show", Data::Trusted},
    {"RamSet", "ram set 2009=0.02", Data::Trusted},
};

/// The image that is written: the fresh one with a difference in several pieces.
Bytes ImageToWrite() {
    Bytes image = Service::FreshImage();
    for (std::uint16_t id = Protocol::PropertyIds::FirstRawWord; id < Service::LastWritableRawWord; ++id) {
        Service::SetRawWord(image, id, 0xA5000000U + id);
    }
    image.back() ^= 0x55;
    return image;
}

class ToolSweep : public testing::TestWithParam<std::tuple<Transport, std::size_t>> {
  protected:
    struct Result {
        ExitCode code = ExitCode::Other;
        std::string out, err;
        Files filesBefore, files;
        Bytes memoryBefore, memory;
        std::uint32_t hits = 0;
    };

    const Transport transport_ = std::get<0>(GetParam());
    const Command& command_ = Commands[std::get<1>(GetParam())];

    static Files FilesIn(const TestFolder& folder) {
        Files files;
        for (const std::string& name : folder.Files()) {
            files[name] = ReadFile(folder.Path(name));
        }
        return files;
    }

    Result Run(const FaultPlan& plan) const {
        const TestClock clock(TestTime::Virtual, 1);
        SimulatedHost host(transport_);
        auto& instrument =
            host.Add(Instrument,
                     {.scanBytes = command_.recording != nullptr ? 30 * RecordSize : Protocol::ReadoutBytes});
        ToolRunner tool;
        const TestFolder& folder = tool.folder;
        WriteFile(folder.Path("image"), ImageToWrite());
        WriteFile(folder.Path("block"), Bytes(Service::BinaryBlockOf(ImageToWrite()).size(), 0x3C));
        const auto script = host.Bus().SetFaults(Instrument, plan);
        Result result;
        result.filesBefore = FilesIn(folder);
        result.memoryBefore = instrument.Eeprom();
        const Stopwatch stopwatch(clock);
        result.code = tool.Run(command_.line);
        stopwatch.ExpectAtMost(90'000);
        result.out = tool.Out();
        result.err = tool.Err();
        result.files = FilesIn(folder);
        result.memory = instrument.Eeprom();
        result.hits = script->Hits();
        EXPECT_EQ(instrument.PendingTransfers(), 0U);
        EXPECT_FALSE(instrument.Claimed());
        host.Bus().SetFaults(Instrument, {});
        instrument.PlugIn();
        EXPECT_TRUE(result.code == ExitCode::Success || tool.Run("reset") == ExitCode::Success) << tool.Err();
        return result;
    }

    /// Wrong bytes in the place of others, and the end of a scan that has no other end, cannot be told from
    /// right ones where nothing protects them.
    bool IsLeftOut(const Fault& fault) const {
        const bool isWrongData = fault.kind == FaultKind::Flip || fault.kind == FaultKind::Garbage ||
                                 fault.kind == FaultKind::Stale;
        const bool isEnd = fault.endpoint == Protocol::BulkInEndpoint &&
                           (fault.kind == FaultKind::Short || fault.kind == FaultKind::Empty);
        // What is sent to an instrument it takes as a whole, so that a driver need not say how much went.
        const bool isUntold = transport_ == Transport::Native && fault.endpoint == ControlEndpoint &&
                              fault.kind == FaultKind::Empty;
        const bool isTrusted = command_.data != Data::Checked &&
                               (isWrongData || (isEnd && command_.data == Data::TrustedOpen) || isUntold);
        // A transfer that reaches a pipe late lets the one behind it take its data: no real one does.
        const bool isOvertaken = command_.recording != nullptr &&
                                 fault.endpoint == Protocol::BulkInEndpoint && fault.kind == FaultKind::Late;
        // Whatever the interrupt pipe brings is a press of the button.
        const bool isEvent =
            command_.showsEvents && (Unplugs(fault) || (fault.endpoint == Protocol::InterruptInEndpoint &&
                                                        fault.kind == FaultKind::Empty));
        return isTrusted || isOvertaken || isEvent;
    }

    static bool Unplugs(const Fault& fault) {
        return fault.kind == FaultKind::GoneBefore || fault.kind == FaultKind::GoneDuring ||
               fault.kind == FaultKind::GoneAfter;
    }

    static std::vector<ExitCode> CodesOf(const Fault& fault) {
        if (fault.endpoint == ControlEndpoint && !Unplugs(fault)) {
            // What an instrument has not understood it does not answer.
            return {ExitCode::InputOutput, ExitCode::Timeout};
        }
        switch (fault.kind) {
            case FaultKind::GoneBefore:
            case FaultKind::GoneDuring:
            case FaultKind::GoneAfter:
                return {ExitCode::NoInstrument};
            case FaultKind::Silent:
            case FaultKind::LateCancel:
                return {ExitCode::Timeout};
            case FaultKind::Late:
                return {};
            default:
                return {ExitCode::InputOutput};
        }
    }

    void ExpectNothingLost(const Result& result, const Result& undisturbed) const {
        for (const auto& [name, content] : result.filesBefore) {
            ASSERT_TRUE(result.files.contains(name)) << name;
            EXPECT_EQ(result.files.at(name), content) << name;
        }
        for (const auto& [name, content] : result.files) {
            if (name == "backup") {
                EXPECT_EQ(content, result.memoryBefore) << "the backup is not what was there";
            } else if (command_.recording != nullptr && name == command_.recording) {
                const Bytes& all = undisturbed.files.at(name);
                EXPECT_GT(content.size(), 0U);
                EXPECT_EQ(content.size() % RecordSize, 0U);
                EXPECT_LE(content.size(), all.size());
                EXPECT_TRUE(std::equal(content.begin(), content.end(), all.begin()));
            } else {
                ASSERT_TRUE(undisturbed.files.contains(name)) << name << " was left behind";
                EXPECT_EQ(content, undisturbed.files.at(name)) << name;
            }
        }
        if (result.memory != result.memoryBefore) {
            const bool hasBackup = undisturbed.files.contains("backup");
            EXPECT_EQ(result.files.contains("backup"), hasBackup);
            EXPECT_THAT(result.err,
                        testing::ContainsRegex(hasBackup ? "ostra eeprom restore" : "again|once more"));
        }
    }

    void Check(const Fault& fault, const Result& result, const Result& undisturbed) const {
        SCOPED_TRACE(FaultText(fault) + "\n" + result.err);
        if (result.code == undisturbed.code) {
            EXPECT_EQ(result.out, undisturbed.out);
            EXPECT_EQ(result.files, undisturbed.files);
            EXPECT_EQ(result.memory, undisturbed.memory);
            return;
        }
        EXPECT_THAT(CodesOf(fault), testing::Contains(result.code));
        EXPECT_THAT(result.err, testing::HasSubstr("ostra: "));
        EXPECT_THAT(result.err, testing::HasSubstr("\n       ")) << "no advice";
        ExpectNothingLost(result, undisturbed);
    }
};

TEST_P(ToolSweep, SucceedsWholeOrFailsWithNothingLost) {
    const Result undisturbed = Run({});
    ASSERT_TRUE(undisturbed.code == ExitCode::Success || undisturbed.code == ExitCode::Different)
        << undisturbed.err;
    int cases = 0, leftOut = 0, ran = 0;
    for (const auto& [endpoint, endpointName, words] : Protocol::EndpointNames) {
        bool isHit = true;
        for (std::uint32_t index = 0; isHit && !HasFailure(); ++index) {
            isHit = false;
            for (const auto& name : Simulator::AllFaults()) {
                Fault fault{endpoint, index, false, name.kind, {}};
                if (name.kind == FaultKind::Late) {
                    fault.argument = 20;
                }
                if (IsLeftOut(fault)) {
                    ++leftOut;
                    continue;
                }
                // A build that checks memory takes its time: it tries some of them.
                if (++ran % OSTRA_SWEEP_STEP != 0 && isHit) {
                    continue;
                }
                const Result result = Run(FaultPlan({fault}));
                if (result.hits == 0) {
                    break;  // there is no such transfer
                }
                isHit = true;
                ++cases;
                Check(fault, result, undisturbed);
            }
        }
    }
    EXPECT_GT(cases, 0);
    std::printf("%d cases, %d left out\n", cases, leftOut);
    RecordProperty("cases", cases);
}

OSTRA_SWEEP_BOTH_TRANSPORTS(ToolSweep, Commands);

}  // namespace
}  // namespace Varnholt::Tests
