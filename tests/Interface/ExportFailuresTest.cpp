// What a host learns when an instrument fails under a call, and which instruments a call touches.
#include <algorithm>
#include <array>
#include <functional>
#include <stdexcept>

#include "ostra.h"
#include "Platform/ErrorCodes.h"
#include "Platform/Usb/InterceptingDevice.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"
#include "Support/DriverTest.h"
#include "Support/SimulatedHost.h"

namespace Varnholt::Tests {
namespace {

using testing::Each;
using testing::ElementsAre;

constexpr std::int32_t Untouched = 0x5A5A5A5A;

/// The calls of a host, over either transport.
class Calls : public testing::TestWithParam<Transport> {
  protected:
    Calls() {
        values_.fill(Untouched);
        image_.fill(0x5A);
    }
    static bool IsNative() { return GetParam() == Transport::Native; }
    static std::string LastError() { return b5ae189db26b2a1b("LastError"); }
    std::int32_t Readout(const std::string& name = "") {
        return d4fb86cecc88582a(values_.data(), name.c_str());
    }
    std::int32_t WriteImage() const { return f3355d91d5df0e0b(image_.data(), ""); }

    TestClock clock_{TestTime::Virtual, 1};
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values_{};
    std::array<std::uint8_t, OSTRA_IMAGE_SIZE> image_{};
};

/// Notes who claims an instrument, gives it back, and sends what request.
class Witness final : public Platform::Usb::InterceptingDevice {
  public:
    Witness(std::shared_ptr<UsbDevice> behind, const std::string& name, Lines& notes)
        : InterceptingDevice(std::move(behind)), suffix_(" " + name), lines_(notes) {}
    ~Witness() override { Detach(); }

    Platform::ErrorCode Claim() override {
        lines_.push_back("claim" + suffix_);
        return InterceptingDevice::Claim();
    }
    void Release() override {
        lines_.push_back("release" + suffix_);
        InterceptingDevice::Release();
    }

  private:
    void BeforeSubmit(std::uint64_t, Platform::Usb::Transfer& transfer) override {
        if (transfer.endpoint == 0) {
            lines_.push_back(Hex(&transfer.setup.request, 1) + suffix_);
        }
    }
    void AfterCompletion(std::uint64_t, Platform::Usb::Transfer&) noexcept override {}
    void Refused(std::uint64_t, Platform::Usb::Transfer&, Platform::ErrorCode) override {}

    const std::string suffix_;
    Lines& lines_;
};

class CallsOnInstruments : public Calls {
  protected:
    CallsOnInstruments() {
        host_.Bus().WrapDevices([this](const std::string& name, auto device) {
            return std::make_shared<Witness>(device, name, notes_);
        });
    }
    /// Since the last call, without the report of an untouched button, which only one transport sends.
    Lines TakeNotes() {
        std::erase_if(notes_, [](const std::string& line) { return line.starts_with("D0"); });
        return std::exchange(notes_, {});
    }

    Lines notes_;
    SimulatedHost host_{GetParam()};
};

TEST_P(CallsOnInstruments, EndWithTheTransferThatFails) {
    auto& instrument = host_.Add("a");
    const std::vector<std::uint8_t> before = instrument.Eeprom();
    const std::string stalled = " (Win32 Error (31) : " + Platform::ErrorText(31) + ")";
    const struct {
        const char* fault;
        std::string nativeText;
        const char* usbIoName;
        std::size_t pieces;  ///< of the image, that arrive; 0: a readout
    } cases[] = {
        {"bulk-in 0:stall", "read data failed" + stalled, "ReadSync", 0},
        {"control 1:stall", "Device IO control failed: " + stalled, "ClassOrVendorOutRequest", 0},
        {"control 4:stall", "Device IO control failed: " + stalled, "ClassOrVendorOutRequest", 3},
        {"bulk-out 3:stall", "write data failed" + stalled, "WriteSync", 1},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.fault);
        host_.Bus().SetFaults("a", Simulator::FaultPlan::Parse(row.fault));
        instrument.SetEeprom(before);
        notes_.clear();
        EXPECT_EQ(row.pieces == 0 ? Readout() : WriteImage(),
                  row.pieces == 0 ? OSTRA_FAILURE : OSTRA_UNKNOWN_FAILURE);
        EXPECT_EQ(LastError(), IsNative()
                                   ? row.nativeText
                                   : std::string("Error in UsbIo function: \"") + row.usbIoName +
                                         "\" Error: Error code 0xE0000030: USBD Error: Endpoint halted.");
        EXPECT_THAT(values_, Each(Untouched));
        std::vector<std::uint8_t> expected = before;
        std::copy_n(image_.begin(), row.pieces * Protocol::EepromWritePiece, expected.begin());
        EXPECT_EQ(instrument.Eeprom(), expected);
        Lines requests = row.fault[0] == 'b' && row.pieces == 0 ? Lines{"C1 a", "C0 a"} : Lines{"C1 a"};
        if (row.pieces > 0) {
            requests.assign(row.pieces + 1, "C3 a");
        }
        requests.insert(requests.begin(), {"claim a", "CA a"});
        requests.emplace_back("release a");
        EXPECT_EQ(TakeNotes(), requests) << "nothing is tried again";
        EXPECT_FALSE(instrument.Claimed());
    }
}

TEST_P(CallsOnInstruments, OpenOneAfterTheOtherUpToTheNamedOne) {
    host_.Add("a");
    auto& second = host_.Add("b");
    const Lines first{"claim a", "CA a", "release a"};
    Lines both = first;
    both.insert(both.end(), {"claim b", "CA b", "release b"});
    EXPECT_EQ(Readout(host_.Identifier("c")), OSTRA_FAILURE);
    EXPECT_EQ(TakeNotes(), both);
    EXPECT_EQ(Readout(host_.Identifier("b")), OSTRA_OK);
    both.insert(both.end() - 1, {"C1 b", "C0 b"});
    EXPECT_EQ(TakeNotes(), both);
    EXPECT_EQ(Readout(), OSTRA_OK);
    EXPECT_THAT(TakeNotes(), ElementsAre("claim a", "CA a", "C1 a", "C0 a", "release a"));
    second.Unplug();
    EXPECT_EQ(Readout(host_.Identifier("b")), OSTRA_FAILURE);
    EXPECT_EQ(TakeNotes(), first);
}

class CallsOnADriver : public Calls {
  protected:
    CallsOnADriver() { Platform::Override64BitHost(!IsNative()); }
    ~CallsOnADriver() override { Platform::Override64BitHost(std::nullopt); }

    const std::uint32_t in_ = IsNative() ? 1U : Protocol::BulkInEndpoint;
    const std::uint32_t out_ = IsNative() ? 2U : Protocol::BulkOutEndpoint;
    ScriptedDriver driver_;
    const Platform::ScopedDeviceFiles files_{driver_};
};

TEST_P(CallsOnADriver, TellWhatIsThrownBelowThem) {
    const struct {
        std::function<void()> fail;
        std::int32_t code;  ///< of a readout
        const char* text;
    } cases[] = {{[] { throw std::runtime_error("why"); }, OSTRA_FAILURE, "why"},
                 {[] { throw std::out_of_range("why"); }, OSTRA_UNKNOWN_FAILURE, "unknown error"},
                 {[] { throw 7; }, OSTRA_FAILURE, "unkown exception caught"}};
    for (const auto& row : cases) {
        driver_.Script(in_, {.onStart = row.fail});
        EXPECT_EQ(Readout(), row.code);
        EXPECT_EQ(LastError(), row.text);
        driver_.Script(out_, {.onStart = row.fail});
        EXPECT_EQ(WriteImage(), OSTRA_UNKNOWN_FAILURE);
        EXPECT_EQ(LastError(), row.text);
        EXPECT_THAT(values_, Each(Untouched));
        EXPECT_EQ(driver_.OpenFiles(), 0U);
    }
}

TEST_P(CallsOnADriver, WaitASecondBetweenTheResetAndTheParameters) {
    std::vector<std::uint64_t> starts;
    for (int request = 0; request < 3; ++request) {
        driver_.Script(IsNative() ? Protocol::NativeDriver::ControlVendorRequest
                                  : Protocol::UsbIoDriver::Control::ClassOrVendorOutRequest,
                       {.onStart = [&] { starts.push_back(Platform::ClockScheduler().Now()); }});
    }
    driver_.Script(in_, {.data = Counting(256)});
    ASSERT_EQ(Readout(), OSTRA_OK) << LastError();
    ASSERT_EQ(starts.size(), 3U);
    if (clock_.IsVirtual()) {
        EXPECT_EQ(starts[1] - starts[0], 1'001'000U) << "a request takes a pause of a millisecond itself";
        EXPECT_EQ(starts[2] - starts[1], 1'000U);
    }
}

const auto BothTransports = testing::Values(Transport::Native, Transport::UsbIo);
const auto NameOf = [](const auto& parameter) { return std::string(Name(parameter.param)); };
INSTANTIATE_TEST_SUITE_P(Transports, CallsOnInstruments, BothTransports, NameOf);
INSTANTIATE_TEST_SUITE_P(Transports, CallsOnADriver, BothTransports, NameOf);

}  // namespace
}  // namespace Varnholt::Tests
