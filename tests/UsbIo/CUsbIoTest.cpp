#include <array>
#include <cstdio>
#include <span>

#include "Protocol/Instrument.h"
#include "Support/DriverTest.h"
#include "UsbIo/CUsbIoPipe.h"
#include "UsbIo/StatusTexts.h"

namespace Varnholt::UsbIo {
namespace {

using namespace Protocol;
using namespace Protocol::UsbIoDriver;
using namespace Tests;

TEST(CUsbIoErrorText, EveryStatusHasTheTextOfTheDocumentedTable) {
    const std::string unknown = StatusText(5);
    EXPECT_EQ(unknown, "Windows system error code.");
    std::vector<std::uint32_t> statuses(0x60002);
    std::iota(statuses.begin() + 1, statuses.end(), 0xE0000000);
    statuses.insert(statuses.end(), {0xE8000FFF, 0xE8001000, 0xE8001001});
    // FNV-1a over the table as USBIO's documentation has it: "0xE0000001 HC Error: Wrong CRC." and a line's
    // end, ordered by code.
    std::uint64_t digest = 0xCBF29CE484222325;
    int rows = 0;
    for (const std::uint32_t status : statuses) {
        if (StatusText(status) == unknown) {
            continue;
        }
        ++rows;
        char code[16];
        std::snprintf(code, sizeof code, "0x%08X ", status);
        for (const char byte : code + std::string(StatusText(status)) + "\n") {
            digest = (digest ^ static_cast<std::uint8_t>(byte)) * 0x100000001B3;
        }
    }
    EXPECT_EQ(rows, 85);
    EXPECT_EQ(digest, 0xDFC676ED55E11C7C) << "a code or a text has changed";
}

TEST(CUsbIoErrorText, IsCutToTheBuffer) {
    const std::string whole = "Error code 0x00000000: No error.";
    for (const std::size_t size :
         {std::size_t{0}, std::size_t{1}, std::size_t{10}, whole.size(), whole.size() + 1}) {
        std::string buffer(64, '#');
        EXPECT_EQ(CUsbIo::ErrorText(buffer.data(), size, 0), buffer.data());
        const std::string written = size == 0 ? "" : whole.substr(0, size - 1) + '\0';
        EXPECT_EQ(buffer, written + std::string(64 - written.size(), '#')) << size;
    }
    EXPECT_EQ(CUsbIo::ErrorText(nullptr, 10, 0), nullptr);
}

class CUsbIoTest : public Tests::DriverTest {
  protected:
    CUsbIoTest() : DriverTest(Tests::TestTime::RealForThreadSanitizer, {"usbio/1", "usbio/2"}) {}

    std::uint32_t Open(CUsbIo& device, int number = 0) {
        const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
        return device.Open(number, list, &InterfaceClass);
    }
};

TEST_F(CUsbIoTest, OpensByListAndByNumber) {
    CUsbIo device;
    EXPECT_EQ(device.GetDevicePathName(), nullptr);
    driver_.Script(Control::GetDriverInfo, {.data = {0xFF, 2}});
    EXPECT_EQ(Open(device, 1), Status::Success) << "of any minor version from 30 on";
    EXPECT_STREQ(device.GetDevicePathName(), "usbio/2");
    EXPECT_EQ(Open(device, 0), Status::AlreadyOpen);
    EXPECT_STREQ(device.GetDevicePathName(), "usbio/2");
    DriverInfo info;
    EXPECT_EQ(device.GetDriverInfo(info), Status::Success);
    device.Close();
    EXPECT_EQ(device.GetDevicePathName(), nullptr);
    EXPECT_EQ(device.Open(3, nullptr, nullptr), Status::Success);
    EXPECT_EQ(device.GetDevicePathName(), nullptr);
    device.Close();
    const std::string ask = "control 8094206C / [12]";
    EXPECT_THAT(driver_.TakeTranscript(),
                ElementsAre("open usbio/2", ask, ask, "close usbio/2", "open \\\\.\\USBIO_Device3", ask,
                            "close \\\\.\\USBIO_Device3"));
}

TEST_F(CUsbIoTest, AFailedOpenLeavesTheObjectClosed) {
    using Tests::FailCalls;
    const auto version = [this](std::uint8_t minor, std::uint8_t major) {
        driver_.Script(Control::GetDriverInfo, {.data = {minor, major}});
    };
    const std::vector<std::tuple<const char*, int, std::function<void()>, std::uint32_t>> cases{
        {"no such device", 2, [] {}, Status::NoSuchDeviceInstance},
        {"file not found", 0, [&] { driver_.RefuseOpen("usbio/1", 2); }, Status::DeviceNotFound},
        {"file refused", 0, [&] { driver_.RefuseOpen("usbio/1", 5); }, 5},
        {"no event", 1, [] { FailCalls("MakeAutoResetEvent", 8); }, Status::NoMemory},
        {"no enumeration", 0, [] { FailCalls("LoadEnumeration", 126); }, Status::NoEnumeration},
        {"interface cannot be read", 0, [] { FailCalls("ReadPath", 13); }, 13},
        {"no detail", 0, [] { FailCalls("ReadPath", Platform::Errors::NoInterfaceDetail); }, Status::Failed},
        {"driver refuses", 1, [&] { driver_.Script(Control::GetDriverInfo, {.code = 31, .after = 5}); }, 31},
        {"older driver", 1, [&] { version(0x2F, 2); }, Status::VersionMismatch},
        {"newer driver", 1, [&] { version(0, 3); }, Status::VersionMismatch},
    };
    for (const auto& [name, number, arrange, expected] : cases) {
        CUsbIo device;
        {
            const Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
            arrange();
            EXPECT_EQ(device.Open(number, list, &InterfaceClass), expected) << name;
        }
        Platform::InstallCallFilter({});
        EXPECT_FALSE(device.IsOpen()) << name;
        EXPECT_EQ(device.GetDevicePathName(), nullptr) << name;
        EXPECT_EQ(driver_.OpenFiles(), 0U) << name;
        EXPECT_EQ(Open(device, 1), Status::Success) << name;
    }
    Platform::DeviceList list = CUsbIo::CreateDeviceList(&InterfaceClass);
    EXPECT_EQ(CUsbIo().Open(0, list, nullptr), Status::InvalidFunctionParameter);
    EXPECT_TRUE(CUsbIo::DestroyDeviceList(list));
    EXPECT_EQ(list, CUsbIo::CreateDeviceList(nullptr)) << "none";
}

TEST_F(CUsbIoTest, SendsTheDriversRecords) {
    CUsbIo device;
    ASSERT_EQ(Open(device), Status::Success);
    driver_.Script(Control::GetDeviceParameters, {.data = Counting(8, 1)});
    DeviceParameters parameters;
    EXPECT_EQ(device.GetDeviceParameters(parameters), 0U);
    EXPECT_EQ(parameters.words[1], 0x08070605U);
    driver_.TakeTranscript();

    const std::array<InterfaceSetting, 2> interfaces{{{0, 1, 65536}, {0x0203, 0x0405, 0x06070809}}};
    EXPECT_EQ(device.SetConfiguration({0x0102, interfaces}), 0U);
    EXPECT_EQ(device.SetDeviceParameters({{0x01020304, 0x05060708}}), 0U);

    const ClassOrVendorRequest request{0x01020304, 2, 0x0A0B0C0D, 0x55, 0xC0, 0x1234, 0x5678};
    std::array<std::uint8_t, 3> data{1, 2, 3};
    std::uint32_t length = data.size();
    EXPECT_EQ(device.ClassOrVendorOutRequest(data.data(), length, request), 0U);
    EXPECT_EQ(length, 3U);
    driver_.Script(Control::ClassOrVendorInRequest, {.data = {9, 8}, .after = 3});
    EXPECT_EQ(device.ClassOrVendorInRequest(data.data(), length, request), 0U);
    EXPECT_EQ(length, 2U);
    driver_.Script(Control::ClassOrVendorInRequest, {.refusal = 170});
    EXPECT_EQ(device.ClassOrVendorInRequest(data.data(), length, request), 170U);
    EXPECT_EQ(length, 0U);
    length = data.size();
    driver_.Script(Control::ClassOrVendorInRequest, {.code = Status::DeviceRemoved, .after = 20});
    EXPECT_EQ(device.ClassOrVendorInRequest(data.data(), length, request), Status::DeviceRemoved);
    EXPECT_THAT(data, ElementsAre(9, 8, 3));

    const std::string unused = " " + Tests::Hex(Bytes(240).data(), 240);
    const std::string block = " 04 03 02 01 02 00 00 00 0D 0C 0B 0A 55 C0 34 12 78 56";
    EXPECT_THAT(driver_.TakeTranscript(),
                ElementsAre("control 80942024 02 01 02 00 00 00 01 00 00 00 01 00 03 02 05 04 09 08 07 06" +
                                unused + " /",
                            "control 80942040 04 03 02 01 08 07 06 05 /",
                            "control 80942035" + block + " / 01 02 03", "control 80942032" + block + " / [3]",
                            "control 80942032" + block + " / [2]", "control 80942032" + block + " / [3]"));

    const std::array<InterfaceSetting, ConfigurationBlock::MaximumEntries + 1> tooMany{};
    EXPECT_EQ(device.SetConfiguration({0, std::span(tooMany).first<ConfigurationBlock::MaximumEntries>()}),
              0U);
    driver_.TakeTranscript();
    EXPECT_EQ(device.SetConfiguration({0, tooMany}), Status::InvalidFunctionParameter);
    EXPECT_THAT(driver_.TakeTranscript(), IsEmpty());
}

TEST_F(CUsbIoTest, ControlsOfSeveralThreadsRunOneAtATime) {
    CUsbIo device;
    ASSERT_EQ(Open(device), Status::Success);
    const auto work = [&] {
        for (int i = 0; i < 5; ++i) {
            driver_.Script(Control::UnconfigureDevice,
                           {.after = 2, .onStart = [&] { EXPECT_EQ(driver_.Running(), 0U); }});
            EXPECT_EQ(device.UnconfigureDevice(), 0U);
        }
    };
    const Tests::BackgroundThread other(work);
    work();
}

constexpr std::uint32_t Pending = Platform::Errors::IoPending;

class CUsbIoPipeTest : public Tests::DriverTest {
  protected:
    void SetUp() override {
        ASSERT_EQ(pipe_.Bind(0, BulkInEndpoint, nullptr, nullptr), Status::Success);
        driver_.TakeTranscript();
    }

    CUsbIoPipe pipe_;
};

TEST_F(CUsbIoPipeTest, BindOpensOnlyAClosedPipe) {
    EXPECT_EQ(pipe_.Bind(0, BulkOutEndpoint, nullptr, nullptr), Status::Success);
    EXPECT_EQ(pipe_.AbortPipe(), Status::Success);
    EXPECT_THAT(driver_.TakeTranscript(), ElementsAre("control 80942078 03 /", "control 80942084 /"));
    CUsbIoPipe other;
    driver_.RefuseOpen("\\\\.\\USBIO_Device7", Platform::Errors::AccessDenied);
    EXPECT_EQ(other.Bind(7, BulkInEndpoint, nullptr, nullptr), Platform::Errors::AccessDenied);
    EXPECT_FALSE(other.IsOpen());
}

TEST_F(CUsbIoPipeTest, ReadSyncReportsStatusAndBytesMoved) {
    constexpr std::uint32_t Bad = Status::EndpointHalted;
    const Bytes data{1, 2, 3, 4};
    const Answer slow{
        .data = data, .after = Never, .count = 99, .cancelledAfter = 60, .cancelledWithData = true};
    const std::vector<std::tuple<const char*, Answer, std::uint32_t, std::uint32_t, std::uint32_t>> cases{
        {"later", {.data = data, .after = 50}, 0, 4, 50},
        {"fails at once", {.code = Bad}, Bad, 0, 0},
        {"fails later with data", {.data = {1, 2}, .code = Bad, .after = 5}, Bad, 2, 5},
        {"silent", {.after = Never}, Status::TimedOut, 0, 100},
        {"cancelled slowly, with more data than there is room for", slow, Status::TimedOut, 4, 160},
        {"more than there is room for", {.data = data, .count = 99}, 0, 4, 0},
    };
    for (const auto& [name, answer, status, moved, milliseconds] : cases) {
        SCOPED_TRACE(name);
        driver_.Script(BulkInEndpoint, answer);
        Bytes buffer(4, 0xEE), expected(4, 0xEE);
        std::uint32_t size = 4;
        const Tests::Stopwatch stopwatch(clock_);
        EXPECT_EQ(pipe_.ReadSync(buffer.data(), size, 100), status);
        stopwatch.ExpectBetween(milliseconds, milliseconds + 1);
        EXPECT_EQ(size, moved);
        std::copy_n(data.begin(), moved, expected.begin());
        EXPECT_EQ(buffer, expected);
        EXPECT_EQ(driver_.Running(BulkInEndpoint), 0U);
    }
    std::uint8_t byte = 0;
    std::uint32_t size = 1;
    EXPECT_EQ(pipe_.ReadSync(&byte, size, 0), Status::TimedOut);
}

TEST_F(CUsbIoPipeTest, AnEventEndsTheWaitButNotTheTransfer) {
    const Platform::OwnedHandle mutex(Platform::MakeMutex(""));
    BackgroundThread([&] { Platform::Wait(mutex.Get(), 0); }).Join();
    const Platform::OwnedHandle event(Platform::MakeAutoResetEvent());
    driver_.Script(BulkInEndpoint, {.data = {5}, .after = 80});
    CUsbIoBuffer buffer(8);
    buffer.NumberOfBytesToTransfer = buffer.Size;
    ASSERT_TRUE(pipe_.Read(buffer));
    EXPECT_EQ(buffer.Status, Pending);
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, 0), Status::TimedOut);
    Platform::SignalEvent(event.Get());
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, Platform::Infinite, event.Get()), Status::UserEvent);
    EXPECT_EQ(buffer.Status, Pending);
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, Platform::Infinite, mutex.Get()), 0x81U) << "abandoned, second";
    EXPECT_EQ(pipe_.WaitForCompletion(buffer, Platform::Infinite, event.Get()), Status::Success);
    EXPECT_EQ(buffer.BytesTransferred, 1U);
    driver_.Script(BulkInEndpoint, {});
    EXPECT_TRUE(pipe_.Read(buffer)) << "that is over at once";
}

TEST_F(CUsbIoPipeTest, RefusesTransfersThatCannotBeRight) {
    CUsbIoBuffer buffer(8);
    buffer.NumberOfBytesToTransfer = 9;
    EXPECT_FALSE(pipe_.Read(buffer));
    EXPECT_EQ(buffer.Status, Platform::Errors::InvalidParameter);
    buffer.NumberOfBytesToTransfer = 8;
    pipe_.Close();
    EXPECT_FALSE(pipe_.Write(buffer));
    EXPECT_EQ(buffer.Status, Platform::Errors::InvalidHandle);

    Tests::FailCalls("MakeAutoResetEvent");
    CUsbIoBuffer withoutEvent(8);
    Platform::InstallCallFilter({});
    withoutEvent.NumberOfBytesToTransfer = 8;
    EXPECT_FALSE(pipe_.Read(withoutEvent));
    EXPECT_EQ(withoutEvent.Status, Platform::Errors::NoSystemResources);
}

}  // namespace
}  // namespace Varnholt::UsbIo
