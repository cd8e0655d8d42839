#include <cstddef>
#include <cstdint>

#include "ImageCheck.h"

/// A damaged EEPROM image is refused or loaded, and what its dump holds is read back the same. The input is a
/// list of changes to a fresh image, which reaches deeper than 8192 free bytes would.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    Varnholt::DeviceDriver::Ostra::LowLevel::CheckRecords(data, size);
    return 0;
}
