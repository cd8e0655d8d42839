// The shipped library under Wine, on instruments that stand-in kernel drivers present: on 32-bit Windows over
// the instrument's own driver, on 64-bit Windows over the USBIO driver.
#include <gmock/gmock.h>

#include <array>
#include <atomic>
#include <iterator>
#include <memory>
#include <set>
#include <span>
#include <sstream>
#include <thread>

#include "Interface/Operations.h"
#include "ostra.h"
#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/EventScheduler.h"
#include "SimulatedBus.h"
#include "StandInDriver.h"
#include "Support/Bytes.h"
#include "Support/TestFolder.h"
#include "TransferRecorder.h"

namespace Varnholt::Tests {
namespace {

using testing::HasSubstr;

/// ostra.dll, loaded as a host loads it.
class ShippedLibrary final {
  public:
    /// As the command line gave it.
    inline static std::string path;

    ShippedLibrary() {
        if (module == nullptr) {
            throw std::runtime_error(path + " does not load: error " + std::to_string(GetLastError()));
        }
    }
    ~ShippedLibrary() { FreeLibrary(module); }
    ShippedLibrary(const ShippedLibrary&) = delete;
    ShippedLibrary& operator=(const ShippedLibrary&) = delete;

    std::int32_t WriteImage(const std::vector<std::uint8_t>& image, const std::string& instrument) {
        return writeImage_(image.data(), instrument.c_str());
    }
    std::int32_t TakeReadout(const std::string& instrument) {
        return takeReadout_(values.data(), instrument.c_str());
    }
    std::string LastError() { return getInformation_("LastError"); }

    /// What the last successful readout has stored.
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values{};

    const HMODULE module = LoadLibraryA(path.c_str());

  private:
    decltype(&f3355d91d5df0e0b) writeImage_ =
        Platform::FindEntryPoint<decltype(f3355d91d5df0e0b)>(module, "f3355d91d5df0e0b");
    decltype(&d4fb86cecc88582a) takeReadout_ =
        Platform::FindEntryPoint<decltype(d4fb86cecc88582a)>(module, "d4fb86cecc88582a");
    decltype(&b5ae189db26b2a1b) getInformation_ =
        Platform::FindEntryPoint<decltype(b5ae189db26b2a1b)>(module, "b5ae189db26b2a1b");
};

/// The number of open handles of this process is the same at the end of the object's life as at its
/// beginning.
class HandleBalance final {
  public:
    HandleBalance() : before_(Count()) {}
    ~HandleBalance() { EXPECT_EQ(Count(), before_) << "handles of the process"; }
    HandleBalance(const HandleBalance&) = delete;
    HandleBalance& operator=(const HandleBalance&) = delete;

  private:
    static DWORD Count() {
        DWORD count = 0;
        GetProcessHandleCount(GetCurrentProcess(), &count);
        return count;
    }
    const DWORD before_;
};

/// The library and the driver are loaded once; every test begins without an instrument.
class Shipped : public testing::Test {
  protected:
    static void SetUpTestSuite() {
        driver = std::make_unique<StandInDriver>(StandInDriver::HostIs64Bit() ? usbIoDriver : nativeDriver);
        library = std::make_unique<ShippedLibrary>();
        // What the system keeps open from its first use on is no loss of a later call.
        const std::string path = driver->PlugIn();
        library->TakeReadout(path);
        driver->Unplug(path);
    }
    static void TearDownTestSuite() {
        library.reset();
        driver.reset();
    }
    void TearDown() override { driver->UnplugAll(); }

    std::int32_t WriteImage(const std::vector<std::uint8_t>& image, const std::string& instrument) {
        const HandleBalance balance;
        return library->WriteImage(image, instrument);
    }
    std::int32_t TakeReadout(const std::string& instrument) {
        const HandleBalance balance;
        return library->TakeReadout(instrument);
    }

    inline static std::unique_ptr<StandInDriver> driver;
    inline static std::unique_ptr<ShippedLibrary> library;

  public:
    inline static std::string nativeDriver, usbIoDriver, tool, example, simulatedLibrary;
};

using Values = std::array<std::int32_t, OSTRA_READOUT_VALUES>;

std::string Quoted(const std::string& path) {
    return '"' + path + '"';
}

constexpr const char* PrintedPath = "C:\\printed";

/// A second process. What it prints goes to the file `PrintedPath`.
class ChildProcess final {
  public:
    explicit ChildProcess(std::string commandLine) {
        SECURITY_ATTRIBUTES inherited{sizeof inherited, nullptr, TRUE};
        STARTUPINFOA startup{};
        startup.cb = sizeof startup;
        startup.dwFlags = STARTF_USESTDHANDLES;
        startup.hStdOutput = CreateFileA(PrintedPath, GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                                         &inherited, CREATE_ALWAYS, 0, nullptr);
        startup.hStdError = startup.hStdOutput;
        CreateProcessA(nullptr, commandLine.data(), nullptr, nullptr, TRUE, 0, nullptr, nullptr, &startup,
                       &process_);
        CloseHandle(startup.hStdOutput);
    }
    ~ChildProcess() {
        Wait();
        CloseHandle(process_.hThread);
        CloseHandle(process_.hProcess);
    }
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    /// Waits for its end and gives its exit code.
    DWORD Wait() {
        DWORD code = STILL_ACTIVE;
        WaitForSingleObject(process_.hProcess, 120'000);  // in an emulated machine a program is slow
        GetExitCodeProcess(process_.hProcess, &code);
        return code;
    }

  private:
    PROCESS_INFORMATION process_{};
};

/// Runs a program to its end; gives its exit code and what it printed.
std::pair<DWORD, std::string> RunProgram(const std::string& commandLine) {
    const DWORD code = ChildProcess(commandLine).Wait();
    return {code, ReadText(PrintedPath)};
}

/// The example host, which takes a readout through the library at `path`.
std::pair<DWORD, std::string> RunExample(const std::string& path, const std::string& arguments) {
    return RunProgram(Quoted(Shipped::example) + ' ' + Quoted(path) + ' ' + arguments);
}

/// Runs an operation on the same instrument with everything in this process; gives what went over the wire.
template <class Operation>
std::string TranscriptInProcess(std::uint64_t seed, Operation operation) {
    Simulator::TransferRecorder recorder;
    Simulator::SimulatedBus bus(Platform::ClockScheduler());
    bus.WrapDevices([&](const std::string&, auto device) { return recorder.Record(std::move(device)); });
    bus.Add("simulated", {.seed = seed});
    const auto files = Platform::Drivers::MakeDriverFileSystem(bus);
    const Platform::ScopedDeviceFiles inForce(*files);
    operation();
    return recorder.Text(Simulator::TestControls::TranscriptBytes);
}

TEST_F(Shipped, ReadoutAndImageAreTheSameAsInProcess) {
    const std::string path = driver->PlugIn();
    Instrument(path).TakeTranscript();
    ASSERT_EQ(TakeReadout(""), OSTRA_OK) << library->LastError();
    EXPECT_EQ(library->LastError(), "");
    EXPECT_GT(std::set<std::int32_t>(library->values.begin(), library->values.end()).size(), 30U);
    Values values{};
    const std::string transcript =
        TranscriptInProcess(driver->SeedOf(path), [&] { Interface::TakeReadout(values, ""); });
    EXPECT_THAT(library->values, testing::ElementsAreArray(values));
    EXPECT_EQ(Instrument(path).TakeTranscript(), transcript);
    EXPECT_EQ(Instrument(path).Counts().measurements, 1U);
    EXPECT_EQ(Instrument(path).Counts().resets, 1U);

    const std::vector<std::uint8_t> image = CountingImage(3);
    EXPECT_EQ(WriteImage(image, path), OSTRA_OK) << library->LastError();
    EXPECT_EQ(Instrument(path).Eeprom(), image);
    EXPECT_EQ(Instrument(path).TakeTranscript(), TranscriptInProcess(driver->SeedOf(path), [&] {
                  Interface::WriteImage(std::span<const std::uint8_t, OSTRA_IMAGE_SIZE>(image), "");
              }));
}

/// The other process takes the instrument that is listed first: on the way to another one it would try that
/// first.
TEST_F(Shipped, TwoProcessesReadTwoInstrumentsAtOnce) {
    const std::string first = driver->PlugIn();
    const std::string second = driver->PlugIn();
    std::atomic<std::int32_t> code = -1;
    std::thread reader([&] { code = library->TakeReadout(second); });
    while (code == -1 && Instrument(second).Counts().measurements == 0) {
        Sleep(5);
    }
    const auto [exitCode, printed] = RunExample(ShippedLibrary::path, Quoted(first));
    EXPECT_EQ(exitCode, 0U) << printed;
    reader.join();
    EXPECT_EQ(code, OSTRA_OK) << library->LastError();
    EXPECT_EQ(Instrument(first).Counts().measurements, 1U);
    EXPECT_EQ(Instrument(second).Counts().measurements, 1U);
}

TEST_F(Shipped, InstrumentIsPulledOutUnderAReadout) {
    const std::string path = driver->PlugIn();
    Instrument(path).SetFaults("bulk-in 0:silent");
    std::thread puller([&] {
        while (Instrument(path).Counts().measurements == 0) {
            Sleep(5);
        }
        Sleep(50);
        driver->Unplug(path);
    });
    const DWORD start = GetTickCount();
    const std::int32_t code = library->TakeReadout(path);
    const DWORD elapsed = GetTickCount() - start;
    const std::string text = library->LastError();
    puller.join();
    EXPECT_EQ(code, OSTRA_FAILURE);
    EXPECT_THAT(text, HasSubstr(StandInDriver::HostIs64Bit() ? "E000" : "(1167)"));
    // Well below what it takes when nobody notices; closing the instrument takes its own time.
    EXPECT_LT(elapsed, 8000U);

    EXPECT_EQ(TakeReadout(path), OSTRA_FAILURE);
    EXPECT_EQ(library->LastError(), "");
    const std::string again = driver->PlugIn();
    EXPECT_EQ(TakeReadout(again), OSTRA_OK) << library->LastError();
}

Values ReadoutInProcess(std::uint64_t seed) {
    Values values{};
    TranscriptInProcess(seed, [&] { Interface::TakeReadout(values, ""); });
    return values;
}

std::vector<std::int32_t> ValuesIn(const std::string& printed) {
    std::istringstream stream(printed);
    return {std::istream_iterator<std::int32_t>(stream), {}};
}

/// From an image made by the tool to a readout by the example host.
TEST_F(Shipped, ProgramsDoTheWholeJob) {
    const std::string listing = Quoted(tool) + " list --json";
    EXPECT_EQ(RunProgram(listing).first, 3U) << "no instrument is connected";
    const std::string path = driver->PlugIn();
    const auto [code, printed] = RunProgram(listing);
    EXPECT_EQ(code, 0U) << printed;
    EXPECT_THAT(printed, HasSubstr(StandInDriver::HostIs64Bit() ? R"("transport":"usbio")"
                                                                : R"("transport":"native")"));
    EXPECT_THAT(printed, HasSubstr(path.substr(path.find("#ostra#"))));

    EXPECT_EQ(RunProgram(Quoted(tool) + " eeprom new C:\\image --force").first, 0U) << ReadText(PrintedPath);
    const auto [exampleCode, values] = RunExample(ShippedLibrary::path, "\"\" C:\\image");
    EXPECT_EQ(exampleCode, 0U) << values;
    EXPECT_THAT(ValuesIn(values), testing::ElementsAreArray(ReadoutInProcess(driver->SeedOf(path))));
    const std::string image = ReadText("C:\\image");
    EXPECT_EQ(Instrument(path).Eeprom(), std::vector<BYTE>(image.begin(), image.end()));
}

/// Without any driver: the instruments are in the host's process.
TEST(Simulated, HostTakesAReadoutAndIsToldOfAFailure) {
    SetEnvironmentVariableA("OSTRA_SIMULATED",
                            "time=real name=broken faults=\"bulk-in 0:stall\" name=lab seed=7");
    const std::string way = StandInDriver::HostIs64Bit() ? "usbio/simulated-" : "native/simulated-";
    const auto [code, values] = RunExample(Shipped::simulatedLibrary, way + "lab");
    EXPECT_EQ(code, 0U) << values;
    EXPECT_THAT(ValuesIn(values), testing::ElementsAreArray(ReadoutInProcess(7)));
    const auto [failureCode, reason] = RunExample(Shipped::simulatedLibrary, way + "broken");
    EXPECT_EQ(failureCode, 1U);
    EXPECT_THAT(reason,
                testing::AllOf(HasSubstr("no readout: "), testing::Not(HasSubstr("no such instrument"))));
    SetEnvironmentVariableA("OSTRA_SIMULATED", nullptr);
}

/// Tells Wine where the program of that name gets its setupapi from.
void ChooseSetupApi(const std::string& program, const std::string& origin) {
    HKEY key = nullptr;
    RegCreateKeyA(HKEY_CURRENT_USER, ("Software\\Wine\\AppDefaults\\" + program + "\\DllOverrides").c_str(),
                  &key);
    RegSetValueExA(key, "setupapi", 0, REG_SZ, reinterpret_cast<const BYTE*>(origin.c_str()),
                   static_cast<DWORD>(origin.size() + 1));
    RegCloseKey(key);
}

TEST_F(Shipped, DoctorNamesTheReason) {
    const bool is64Bit = StandInDriver::HostIs64Bit();
    const auto expect = [](DWORD code, const std::string& text, const std::string& options = "",
                           const std::string& program = Shipped::tool) {
        const auto told = RunProgram(Quoted(program) + " doctor --json" + options);
        EXPECT_EQ(told.first, code) << told.second;
        EXPECT_THAT(told.second, HasSubstr(text));
    };
    expect(3, "no device with either driver is plugged in");
    const std::string path = driver->PlugIn();
    expect(0, is64Bit ? "on 64-bit Windows the USBIO driver is used; devices present: 1"
                      : "on 32-bit Windows the instrument's own driver is used; devices present: 1");
    expect(3, "which is not used here: --transport asks for",
           is64Bit ? " --transport native" : " --transport usbio");
    const std::string copy = "C:\\doctor\\doctor.exe";
    CreateDirectoryA("C:\\doctor", nullptr);
    ASSERT_TRUE(CopyFileA(tool.c_str(), copy.c_str(), FALSE));
    ChooseSetupApi("doctor.exe", "");
    expect(3, "setupapi.dll, which finds instruments, cannot be loaded", "", copy);
    // Any other library lacks the functions.
    ASSERT_TRUE(CopyFileA(ShippedLibrary::path.c_str(), "C:\\doctor\\setupapi.dll", FALSE));
    ChooseSetupApi("doctor.exe", "native");
    expect(3, "setupapi.dll, which finds instruments, lacks functions", "", copy);
    Instrument(path).UseElsewhere();
    // The stand-in for the instrument's own driver has no refusal that Wine passes on: its pipes are gone.
    expect(is64Bit ? 4 : 3, is64Bit ? "used by another process" : "not there any more");
}

TEST_F(Shipped, ToolShowsTheButtonAndTheRemoval) {
    const std::string path = driver->PlugIn();
    ChildProcess monitor(Quoted(tool) + " monitor --for 15");
    const auto shows = [](const char* text) {
        for (int look = 0; look < 400 && ReadText(PrintedPath).find(text) == std::string::npos; ++look) {
            Sleep(20);
        }
        return testing::AssertionResult(ReadText(PrintedPath).find(text) != std::string::npos)
               << ReadText(PrintedPath);
    };
    EXPECT_TRUE(shows("watching"));
    Sleep(200);  // what the button sent before the listener began is thrown away
    Instrument(path).PressButton();
    EXPECT_TRUE(shows(" s  button"));
    driver->Unplug(path);
    EXPECT_TRUE(shows(" s  removed"));
    EXPECT_EQ(monitor.Wait(), 0U);
}

}  // namespace
}  // namespace Varnholt::Tests

int main(int argc, char** argv) {
    using namespace Varnholt::Tests;
    testing::InitGoogleMock(&argc, argv);
    if (argc != 7) {
        std::puts("usage: shipped_library_test LIBRARY NATIVE-DRIVER USBIO-DRIVER TOOL EXAMPLE SIMULATED");
        return 2;
    }
    ShippedLibrary::path = argv[1];
    Shipped::nativeDriver = argv[2];
    Shipped::usbIoDriver = argv[3];
    Shipped::tool = argv[4];
    Shipped::example = argv[5];
    Shipped::simulatedLibrary = argv[6];
    return RUN_ALL_TESTS();
}
