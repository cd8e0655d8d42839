#include "Interface/Operations.h"

#include <algorithm>
#include <array>
#include <vector>

#include "Interface/OpenInstrument.h"
#include "Interface/Readout.h"
#include "Platform/Threads.h"

namespace Varnholt::Interface {
namespace {

constexpr std::uint32_t WaitBeforeReadout = 1000;  // ms
constexpr std::uint32_t ReadoutTimeout = 1;        // s

}  // namespace

void WriteImage(std::span<const std::uint8_t, Protocol::EepromSize> image, const std::string& deviceName) {
    const auto instrument = OpenInstrumentByName(deviceName);
    instrument->WriteEEPROM(0, std::vector<std::uint8_t>(image.begin(), image.end()));
}

void TakeReadout(std::span<std::int32_t, Protocol::ReadoutValues> values, const std::string& deviceName) {
    const auto instrument = OpenInstrumentByName(deviceName);
    Platform::SleepMilliseconds(WaitBeforeReadout);
    instrument->SetMeasureParameters(294, 0, 1, 6);
    std::array<std::uint8_t, Protocol::ReadoutBytes> buffer{};
    instrument->MeasureRequest(buffer.data(), Protocol::ReadoutBytes, ReadoutTimeout);
    std::ranges::copy(ReadoutFromBytes(buffer), values.begin());
}

}  // namespace Varnholt::Interface
