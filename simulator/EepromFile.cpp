#include "EepromFile.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <stdexcept>
#include <utility>

#include "Protocol/Instrument.h"

namespace Varnholt::Simulator {
namespace {

class File final {
  public:
    File(const std::string& name, int flags, mode_t mode = 0)
        : file(open(name.c_str(), flags | O_CLOEXEC, mode)) {}
    ~File() {
        if (file >= 0) {
            close(file);
        }
    }
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    bool IsOpen() const { return file >= 0; }
    bool WriteAll(const std::vector<std::uint8_t>& bytes) const {
        for (std::size_t done = 0; done < bytes.size();) {
            const ssize_t count = write(file, &bytes[done], bytes.size() - done);
            if (count < 0 && errno != EINTR) {
                return false;
            }
            done += static_cast<std::size_t>(count < 0 ? 0 : count);
        }
        return fsync(file) == 0;
    }

  private:
    const int file;
};

/// What was there, whole, or what is new, whole.
bool ReplaceFile(const std::string& fileName, const std::vector<std::uint8_t>& content) {
    const std::string newName = fileName + ".new-" + std::to_string(getpid());
    bool written = false;
    {
        const File file(newName, O_WRONLY | O_CREAT | O_TRUNC, 0666);
        written = file.IsOpen() && file.WriteAll(content);
    }
    if (written && std::rename(newName.c_str(), fileName.c_str()) == 0) {
        return true;
    }
    const int error = errno;
    unlink(newName.c_str());
    errno = error;
    return false;
}

}  // namespace

std::vector<std::uint8_t> ReadEepromFile(const std::string& fileName) {
    std::error_code error;
    const auto size = std::filesystem::file_size(fileName, error);
    if (error) {
        throw std::runtime_error("cannot read " + fileName + ": " + error.message());
    }
    if (size != Protocol::EepromSize) {
        throw std::runtime_error(fileName + " has " + std::to_string(size) + " bytes, but an EEPROM has " +
                                 std::to_string(Protocol::EepromSize) +
                                 "; name another file, or remove this one to begin with a fresh EEPROM");
    }
    std::vector<std::uint8_t> bytes(Protocol::EepromSize);
    std::FILE* const file = std::fopen(fileName.c_str(), "rb");
    const std::size_t count = file ? std::fread(bytes.data(), 1, bytes.size(), file) : 0;
    const int readError = errno;
    if (file) {
        std::fclose(file);
    }
    if (count != bytes.size()) {
        throw std::runtime_error("cannot read " + fileName + ": " + std::strerror(readError));
    }
    return bytes;
}

EepromFile::EepromFile(PollLoop& pollLoop, std::string name, Log logger)
    : loop(pollLoop), fileName(std::move(name)), log(std::move(logger)) {}

EepromFile::~EepromFile() {
    loop.Forget(saving);
}

bool EepromFile::Exists() const {
    std::error_code error;
    return std::filesystem::exists(fileName, error);
}

void EepromFile::Keep(std::shared_ptr<SimulatedInstrument> kept) {
    instrument = std::move(kept);
    if (!Exists()) {
        unsaved = true;
        Save();
    }
}

void EepromFile::MemoryChanged() {
    // An image comes in many pieces.
    constexpr std::uint64_t delay = 100'000;
    unsaved = true;
    if (saving == 0) {
        saving = loop.CallAt(loop.Now() + delay, [this] { Save(); });
    }
}

bool EepromFile::Finish() {
    if (unsaved && instrument) {
        loop.Forget(saving);
        Save();
    }
    return !unsaved;
}

void EepromFile::Save() {
    saving = 0;
    unsaved = !ReplaceFile(fileName, instrument->Eeprom());
    if (unsaved && log) {
        log("cannot write " + fileName + ": " + std::strerror(errno));
    }
}

}  // namespace Varnholt::Simulator
