#pragma once

#include <cstddef>
#include <cstdint>

/// Device controls by which a test reaches the instrument behind a stand-in driver, past the driver's own
/// behaviour. Any handle of the device takes them.
namespace Varnholt::Simulator::TestControls {

constexpr std::uint32_t Code(std::uint32_t function) {
    constexpr std::uint32_t UnknownDevice = 0x22;
    return UnknownDevice << 16 | function << 2;  // any access, buffered
}

inline constexpr std::uint32_t PressButton = Code(0x900);
/// Input: a fault plan as text. It holds for the openings of the instrument that come after it.
inline constexpr std::uint32_t SetFaults = Code(0x901);
/// Once all handles are closed somebody else has the USB device, and openings that need it are refused.
inline constexpr std::uint32_t UseElsewhere = Code(0x903);
/// Output: the content of the EEPROM.
inline constexpr std::uint32_t ReadEeprom = Code(0x904);
/// Output: the transfers of all instruments since it was last asked for, as the text of a recorder.
inline constexpr std::uint32_t TakeTranscript = Code(0x906);
inline constexpr std::size_t TranscriptBytes = 16;  ///< of each transfer's data
/// Output: `Counts`.
inline constexpr std::uint32_t ReadCounts = Code(0x905);

struct Counts {
    std::uint32_t measurements;
    std::uint32_t resets;
    std::uint32_t buttonReports;  ///< sent to an instrument whose button was not touched
    std::uint32_t openFiles;      ///< of this instrument, the asking one included
    std::uint32_t pendingTransfers;
};
static_assert(sizeof(Counts) == 20);

}  // namespace Varnholt::Simulator::TestControls
