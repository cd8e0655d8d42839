#include "Interface/Operations.h"

#include <algorithm>
#include <array>
#include <vector>

#include "Interface/OpenInstrument.h"
#include "Interface/Readout.h"
#include "Platform/Threads.h"

namespace Varnholt::Interface {

void WriteImage(std::span<const std::uint8_t, Protocol::EepromSize> image, const std::string& deviceName) {
    const auto instrument = OpenInstrumentByName(deviceName);
    instrument->WriteEEPROM(0, std::vector<std::uint8_t>(image.begin(), image.end()));
}

void TakeReadout(std::span<std::int32_t, Protocol::ReadoutValues> values, const std::string& deviceName) {
    const auto instrument = OpenInstrumentByName(deviceName);
    Platform::SleepMilliseconds(FixedReadout::WaitAfterOpening);
    instrument->SetMeasureParameters(FixedReadout::P1, FixedReadout::P2, FixedReadout::P3, FixedReadout::P4);
    std::array<std::uint8_t, Protocol::ReadoutBytes> buffer{};
    instrument->MeasureRequest(buffer.data(), Protocol::ReadoutBytes, FixedReadout::Timeout);
    std::ranges::copy(ReadoutFromBytes(buffer), values.begin());
}

}  // namespace Varnholt::Interface
