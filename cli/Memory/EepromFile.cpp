#include "Memory/EepromFile.h"

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <system_error>

#include "Failure.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Cli {

std::vector<std::uint8_t> ReadWholeFile(const std::string& name, std::size_t limit) {
    const auto fail = [&name](const std::string& why) {
        throw ToolFailure(ExitCode::File, "cannot read " + name + ": " + why);
    };
    std::error_code error;
    if (std::filesystem::is_directory(name, error)) {
        fail("it is a directory");
    }
    errno = 0;
    std::ifstream file(name, std::ios::binary);
    if (!file) {
        fail(errno != 0 ? std::generic_category().message(errno) : "it cannot be opened");
    }
    std::vector<std::uint8_t> content(limit + 1);
    file.read(reinterpret_cast<char*>(content.data()), static_cast<std::streamsize>(content.size()));
    if (file.bad()) {
        fail("the reading failed");
    }
    content.resize(static_cast<std::size_t>(file.gcount()));
    return content;
}

EepromImage ReadImageFile(const std::string& name) {
    EepromImage image = ReadWholeFile(name, Protocol::EepromSize);
    if (image.size() != Protocol::EepromSize) {
        const std::string size = image.size() > Protocol::EepromSize
                                     ? "more than " + std::to_string(Protocol::EepromSize)
                                     : std::to_string(image.size());
        throw ToolFailure(
            ExitCode::BadData,
            name + " is no EEPROM image: it has " + size + " bytes instead of " +
                std::to_string(Protocol::EepromSize),
            "`ostra eeprom backup FILE` makes one from an instrument, `ostra eeprom new FILE` a "
            "fresh one");
    }
    return image;
}

}  // namespace Varnholt::Cli
