#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <stdexcept>
#include <vector>

#include "Interface/Readout.h"
#include "ostra.h"
#include "Protocol/Instrument.h"
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

std::vector<std::uint8_t> CountingImage() {
    std::vector<std::uint8_t> image(OSTRA_IMAGE_SIZE);
    for (std::size_t i = 0; i < image.size(); ++i) {
        image[i] = static_cast<std::uint8_t>(i * 7 + i / 256);
    }
    return image;
}

class Exports : public testing::TestWithParam<Transport> {
  protected:
    TestClock clock_{TestTime::Virtual, 1};
    SimulatedHost host_{GetParam()};
    Simulator::TransferRecorder recorder_;
    std::array<std::int32_t, OSTRA_READOUT_VALUES> values_{};

    void Record() {
        host_.Bus().WrapDevices([this](const std::string&, auto device) { return recorder_.Record(device); });
    }
    /// The recorded transfers as text, those of the interrupt endpoint left out: when they happen is the
    /// listener thread's business.
    std::vector<std::string> Transcript() const {
        std::vector<std::string> lines;
        for (const auto& transfer : recorder_.Transfers()) {
            if (transfer.endpoint != Protocol::InterruptInEndpoint) {
                lines.push_back(transfer.Text(8));
            }
        }
        return lines;
    }
};
INSTANTIATE_TEST_SUITE_P(Transports, Exports, testing::Values(Transport::Native, Transport::UsbIo),
                         [](const auto& parameter) { return std::string(Name(parameter.param)); });

TEST_P(Exports, ReadoutSendsItsFixedSequenceAndReturnsTheSensorsValues) {
    auto& instrument = host_.Add("one");
    Record();
    const Stopwatch stopwatch(clock_);
    ASSERT_EQ(d4fb86cecc88582a(values_.data(), ""), OSTRA_OK) << LastError();
    stopwatch.ExpectBetween(1000, 1099);
    EXPECT_EQ(LastError(), "");
    EXPECT_EQ(values_[0], values_[1]);
    EXPECT_EQ(values_[127], values_[126]);
    EXPECT_NE(*std::ranges::max_element(values_), *std::ranges::min_element(values_));
    EXPECT_FALSE(instrument.Claimed());
    EXPECT_EQ(instrument.PendingTransfers(), 0U);

    std::vector<testing::Matcher<std::string>> expected{
        "control CA out 1: 1F", "control C1 out 8: 01 26 00 00 00 01 06 00",
        "control C0 out 0:", testing::StartsWith("bulk-in 256:")};
    if (GetParam() == Transport::Native) {
        expected.emplace_back(testing::StartsWith("control D0 out"));  // the untouched button, at the end
    }
    EXPECT_THAT(Transcript(), testing::ElementsAreArray(expected));
}

TEST_P(Exports, ImageGoesIn32PiecesAndArrivesWhole) {
    auto& instrument = host_.Add("one");
    Record();
    const auto image = CountingImage();
    ASSERT_EQ(f3355d91d5df0e0b(image.data(), host_.Identifier("one").c_str()), OSTRA_OK) << LastError();
    EXPECT_EQ(instrument.Eeprom(), image);
    EXPECT_FALSE(instrument.Claimed());
    const auto lines = Transcript();
    ASSERT_GE(lines.size(), 1U + 32 * 4);
    for (std::size_t piece = 0; piece < 32; ++piece) {
        char request[64];
        std::snprintf(request, sizeof request, "control C3 out 8: 00 00 %02zX 00 01 00 00 00", piece);
        const std::size_t line = 1 + 4 * piece;
        EXPECT_EQ(lines[line], request);
        EXPECT_THAT(lines[line + 1], testing::StartsWith("bulk-out 256: "));
        EXPECT_EQ(lines[line + 2], "bulk-out 1: 00");
        EXPECT_EQ(lines[line + 3], "bulk-out 1: 00");
    }
}

TEST_P(Exports, WithoutAnInstrumentTheTextIsEmpty) {
    const auto image = CountingImage();
    EXPECT_EQ(f3355d91d5df0e0b(image.data(), ""), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(LastError(), "");
    EXPECT_EQ(d4fb86cecc88582a(values_.data(), ""), OSTRA_FAILURE);
    EXPECT_EQ(LastError(), "");
    EXPECT_THAT(values_, Each(0));
}

TEST_P(Exports, TheNamedInstrumentIsTaken) {
    auto& first = host_.Add("a");
    auto& second = host_.Add("b");
    Record();
    const auto image = CountingImage();
    const auto untouched = first.Eeprom();
    ASSERT_EQ(f3355d91d5df0e0b(image.data(), host_.Identifier("b").c_str()), OSTRA_OK) << LastError();
    EXPECT_EQ(second.Eeprom(), image);
    EXPECT_EQ(first.Eeprom(), untouched);
    // The one before it was opened and reset as well.
    EXPECT_EQ(std::ranges::count(Transcript(), "control CA out 1: 1F"), 2);

    EXPECT_EQ(f3355d91d5df0e0b(image.data(), host_.Identifier("B").c_str()), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(LastError(), "");
    first.Unplug();
    EXPECT_EQ(d4fb86cecc88582a(values_.data(), ""), OSTRA_OK);
}

TEST_P(Exports, AnInstrumentThatDoesNotOpenIsPassedOver) {
    host_.Add("a");
    auto& second = host_.Add("b");
    host_.Bus().WrapDevices([this](const std::string& name, auto device) {
        auto recorded = recorder_.Record(device);
        if (name == "a") {
            EXPECT_EQ(device->Claim(), 0U);  // somebody else has it
        }
        return recorded;
    });
    const auto image = CountingImage();
    ASSERT_EQ(f3355d91d5df0e0b(image.data(), ""), OSTRA_OK) << LastError();
    EXPECT_EQ(second.Eeprom(), image);
}

TEST_P(Exports, NullPointersAreRefusedAndTextsFollowTheirRules) {
    host_.Add("one");
    EXPECT_EQ(f3355d91d5df0e0b(nullptr, ""), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(LastError(), "unknown error");
    EXPECT_EQ(f3355d91d5df0e0b(CountingImage().data(), nullptr), OSTRA_UNKNOWN_FAILURE);
    EXPECT_EQ(d4fb86cecc88582a(values_.data(), nullptr), OSTRA_UNKNOWN_FAILURE);
    const std::function<void()> clearing[] = {
        [] { EXPECT_THAT(b5ae189db26b2a1b("SDKVersion"), StrEq("1.0.3")); },
        [] { EXPECT_THAT(b5ae189db26b2a1b("sdkversion"), StrEq("")); },
        [] { EXPECT_THAT(b5ae189db26b2a1b(nullptr), StrEq("")); },
        [] { EXPECT_THAT(c288a3930ffaa9d7(), StrEq("")); },
    };
    EXPECT_EQ(d4fb86cecc88582a(values_.data(), ""), OSTRA_OK);
    EXPECT_EQ(LastError(), "") << "a call that succeeds clears it";
    for (const auto& ask : clearing) {
        EXPECT_EQ(d4fb86cecc88582a(nullptr, ""), OSTRA_UNKNOWN_FAILURE);
        EXPECT_EQ(LastError(), "unknown error");
        EXPECT_EQ(LastError(), "unknown error") << "asking for it does not clear it";
        ask();
        EXPECT_EQ(LastError(), "");
    }
}

/// A failure stores no values, and whatever is thrown ends as a result code.
TEST_P(Exports, WhatIsThrownBelowThemBecomesACodeAndAText) {
    const bool isNative = GetParam() == Transport::Native;
    ScriptedDriver driver;
    const Platform::ScopedDeviceFiles files(driver);
    const auto image = CountingImage();
    values_.fill(7);
    const struct {
        std::function<void()> fail;
        std::int32_t code;  ///< of a readout
        const char* text;
    } cases[] = {{[] { throw std::runtime_error("why"); }, OSTRA_FAILURE, "why"},
                 {[] { throw std::out_of_range("why"); }, OSTRA_UNKNOWN_FAILURE, "unknown error"},
                 {[] { throw 7; }, OSTRA_FAILURE, "unkown exception caught"}};
    for (const auto& row : cases) {
        driver.Script(isNative ? 1U : Protocol::BulkInEndpoint, {.onStart = row.fail});
        EXPECT_EQ(d4fb86cecc88582a(values_.data(), ""), row.code);
        EXPECT_EQ(LastError(), row.text);
        driver.Script(isNative ? 2U : Protocol::BulkOutEndpoint, {.onStart = row.fail});
        EXPECT_EQ(f3355d91d5df0e0b(image.data(), ""), OSTRA_UNKNOWN_FAILURE);
        EXPECT_EQ(LastError(), row.text);
        EXPECT_THAT(values_, Each(7));
        EXPECT_EQ(driver.OpenFiles(), 0U);
    }
}

TEST(Readout, ConvertsBigEndianValuesAndRepeatsTheEdges) {
    std::array<std::uint8_t, Protocol::ReadoutBytes> bytes{};
    const auto put = [&](std::size_t k, std::uint8_t high, std::uint8_t low) {
        bytes[2 * k] = high;
        bytes[2 * k + 1] = low;
    };
    put(0, 0x7F, 0xFF);  // never reaches the caller
    put(1, 0x00, 0x10);
    put(2, 0xF8, 0x00);
    put(3, 0xF8, 0x01);
    put(4, 0xFF, 0xFF);
    put(126, 0x01, 0x00);
    put(127, 0x55, 0x55);  // nor does this one

    const auto values = Interface::ReadoutFromBytes(bytes);
    EXPECT_EQ(values[0], 16);
    EXPECT_EQ(values[1], 16);
    EXPECT_EQ(values[2], 63488);
    EXPECT_EQ(values[3], -2047);
    EXPECT_EQ(values[4], -1);
    EXPECT_EQ(values[126], 256);
    EXPECT_EQ(values[127], 256);
}

}  // namespace
}  // namespace Varnholt::Tests
