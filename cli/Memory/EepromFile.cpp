#include "Memory/EepromFile.h"

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <system_error>

#include "Failure.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Cli {

namespace {

/// At most one byte more than `limit`: that many are too many.
std::vector<std::uint8_t> ReadFileUpTo(const std::string& name, std::size_t limit) {
    const auto fail = [&name](const std::string& why) {
        throw ToolFailure(ExitCode::File, "cannot read " + name + ": " + why);
    };
    std::error_code error;
    const std::filesystem::file_status status = std::filesystem::status(name, error);
    if (std::filesystem::is_directory(status)) {
        fail("it is a directory");
    }
    // Opening a pipe would wait for somebody who writes into it.
    if (std::filesystem::exists(status) && !std::filesystem::is_regular_file(status)) {
        fail("it is no ordinary file");
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

}  // namespace

std::vector<std::uint8_t> ReadFileOfSize(const std::string& name, std::size_t size, const std::string& what,
                                         const std::string& advice) {
    std::vector<std::uint8_t> content = ReadFileUpTo(name, size);
    if (content.size() != size) {
        const std::string found =
            content.size() > size ? "more than " + std::to_string(size) + " bytes"
                                  : std::to_string(content.size()) + " bytes, not " + std::to_string(size);
        throw ToolFailure(ExitCode::BadData, name + " is not " + what + ": it has " + found, advice);
    }
    return content;
}

EepromImage ReadImageFile(const std::string& name) {
    return ReadFileOfSize(
        name, Protocol::EepromSize, "an EEPROM image",
        "`ostra eeprom backup FILE` makes one from an instrument, `ostra eeprom new FILE` a fresh one");
}

}  // namespace Varnholt::Cli
