#include <gmock/gmock.h>

#include <array>
#include <stdexcept>

#include "Interface/Readout.h"
#include "ostra.h"
#include "Support/ScriptedDriver.h"
#include "Support/SimulatedHost.h"
#include "Support/TestClock.h"
#include "TransferRecorder.h"

namespace Varnholt::Tests {
namespace {

using testing::Each;
using testing::StrEq;

std::string LastError() {
    return b5ae189db26b2a1b("LastError");
}

class Exports : public testing::TestWithParam<Transport> {
  protected:
    TestClock clock_{TestTime::Virtual, 1};
    SimulatedHost host_{GetParam()};
    Simulator::TransferRecorder recorder_;
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values_{};
    const std::vector<std::uint8_t> image_ = CountingImage();

    Exports() {
        host_.Bus().WrapDevices([this](const std::string&, auto device) { return recorder_.Record(device); });
    }
    std::int32_t Readout(const char* name = "") { return d4fb86cecc88582a(values_.data(), name); }
    std::int32_t WriteImage(const std::string& name) const {
        return f3355d91d5df0e0b(image_.data(), name.c_str());
    }
};
OSTRA_ON_BOTH_TRANSPORTS(Exports);

TEST_P(Exports, ReadoutSendsItsFixedSequenceAndReturnsTheSensorsValues) {
    auto& instrument = host_.Add("one");
    const Stopwatch stopwatch(clock_);
    ASSERT_EQ(Readout(), OSTRA_OK) << LastError();
    stopwatch.ExpectBetween(1000, 1099);
    EXPECT_EQ(LastError(), "");
    EXPECT_NE(*std::ranges::max_element(values_), *std::ranges::min_element(values_));
    EXPECT_FALSE(instrument.Claimed());
    EXPECT_EQ(instrument.PendingTransfers(), 0U);
    EXPECT_THAT(recorder_.Text(8),
                testing::StartsWith("control CA out 1: 1F\ncontrol C1 out 8: 01 26 00 00 00 01 06 00\n"
                                    "control C0 out 0:\nbulk-in 256: "));
    // Behind it the untouched button, over one of the drivers.
    EXPECT_EQ(std::ranges::count(recorder_.Text(8), '\n'), GetParam() == Transport::Native ? 5 : 4);
}

TEST_P(Exports, ImageGoesIntoTheNamedInstrument) {
    auto& first = host_.Add("a");
    auto& second = host_.Add("b");
    const auto untouched = first.Eeprom();
    ASSERT_EQ(WriteImage(host_.Identifier("b")), OSTRA_OK) << LastError();
    EXPECT_EQ(second.Eeprom(), image_);
    EXPECT_EQ(first.Eeprom(), untouched);
    EXPECT_EQ(first.WithCommands([](const auto& commands) { return commands.resets; }), 1U)
        << "the one before it was opened as well";
    EXPECT_EQ(WriteImage(host_.Identifier("B")), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(LastError(), "");
    Platform::ErrorCode error = Platform::Errors::Success;
    const auto elsewhere = host_.Bus().Open("a", error);
    EXPECT_EQ(elsewhere->Claim(), Platform::Errors::Success);
    EXPECT_EQ(Readout(), OSTRA_OK) << "the one that does not open is passed over";
    second.Unplug();
    EXPECT_EQ(Readout(), OSTRA_FAILURE);
    EXPECT_EQ(LastError(), "");
}

TEST_P(Exports, NullPointersAreRefusedAndTextsFollowTheirRules) {
    host_.Add("one");
    EXPECT_EQ(f3355d91d5df0e0b(nullptr, ""), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(LastError(), "unknown error");
    EXPECT_EQ(f3355d91d5df0e0b(image_.data(), nullptr), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(Readout(nullptr), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(Readout(), OSTRA_OK);
    EXPECT_EQ(LastError(), "") << "a call that succeeds clears it";
    for (const auto& [ask, answer] : std::vector<std::pair<const char* (*)(), const char*>>{
             {[] { return b5ae189db26b2a1b("SDKVersion"); }, "1.0.3"},
             {[] { return b5ae189db26b2a1b(nullptr); }, ""},
             {[] { return c288a3930ffaa9d7(); }, ""},
         }) {
        EXPECT_EQ(d4fb86cecc88582a(nullptr, ""), OSTRA_UNKNOWN_FAILURE);
        EXPECT_EQ(LastError(), "unknown error");
        EXPECT_EQ(LastError(), "unknown error") << "asking for it does not clear it";
        EXPECT_THAT(ask(), StrEq(answer));
        EXPECT_EQ(LastError(), "");
    }
}

/// A failure stores no values, and whatever is thrown ends as a result code.
TEST_P(Exports, WhatIsThrownBelowThemBecomesACodeAndAText) {
    const bool isNative = GetParam() == Transport::Native;
    ScriptedDriver driver;
    const Platform::ScopedDeviceFiles files(driver);
    values_.fill(7);
    // The code is that of a readout.
    const std::vector<std::tuple<std::function<void()>, std::int32_t, const char*>> cases{
        {[] { throw std::runtime_error("why"); }, OSTRA_FAILURE, "why"},
        {[] { throw std::out_of_range("why"); }, OSTRA_UNKNOWN_FAILURE, "unknown error"},
        {[] { throw 7; }, OSTRA_FAILURE, "unkown exception caught"}};
    for (const auto& [fail, code, text] : cases) {
        driver.Script(isNative ? 1U : Protocol::BulkInEndpoint, {.onStart = fail});
        EXPECT_EQ(Readout(), code);
        EXPECT_EQ(LastError(), text);
        driver.Script(isNative ? 2U : Protocol::BulkOutEndpoint, {.onStart = fail});
        EXPECT_EQ(WriteImage(""), OSTRA_UNKNOWN_FAILURE);
        EXPECT_EQ(LastError(), text);
        EXPECT_THAT(values_, Each(7));
        EXPECT_EQ(driver.OpenFiles(), 0U);
    }
}

TEST(Readout, ConvertsBigEndianValuesAndRepeatsTheEdges) {
    std::array<std::uint8_t, Protocol::ReadoutBytes> bytes{};
    // The first and the last one never reach the caller.
    std::ranges::copy(Bytes{0x7F, 0xFF, 0x00, 0x10, 0xF8, 0x00, 0xF8, 0x01, 0xFF, 0xFF}, bytes.begin());
    std::ranges::copy(Bytes{0x01, 0x00, 0x55, 0x55}, bytes.end() - 4);
    const auto values = Interface::ReadoutFromBytes(bytes);
    EXPECT_EQ(std::vector(values.begin(), values.begin() + 5), (std::vector{16, 16, 63488, -2047, -1}));
    EXPECT_EQ(std::vector(values.begin() + 125, values.end()), (std::vector{0, 256, 256}));
}

}  // namespace
}  // namespace Varnholt::Tests
