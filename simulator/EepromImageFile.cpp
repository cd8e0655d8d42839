#include "EepromImageFile.h"

#include <filesystem>
#include <stdexcept>

#include "Protocol/Instrument.h"
#include "Utilities/Files/ByteSource.h"

namespace Varnholt::Simulator {

std::vector<std::uint8_t> ReadEepromFile(const std::string& fileName) {
    const auto source = Utilities::Files::OpenByteSource(fileName);
    std::vector<std::uint8_t> bytes = Utilities::Files::ReadUpTo(*source, Protocol::EepromSize);
    if (bytes.size() != Protocol::EepromSize) {
        std::error_code unknown;
        const auto size = bytes.size() < Protocol::EepromSize ? bytes.size()
                                                              : std::filesystem::file_size(fileName, unknown);
        throw std::runtime_error(fileName + " has " + std::to_string(size) + " bytes, but an EEPROM has " +
                                 std::to_string(Protocol::EepromSize) +
                                 "; name another file, or remove this one to begin with a fresh EEPROM");
    }
    return bytes;
}

}  // namespace Varnholt::Simulator
