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
        : file_(open(name.c_str(), flags | O_CLOEXEC, mode)) {}
    ~File() {
        if (file_ >= 0) {
            close(file_);
        }
    }
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    bool IsOpen() const { return file_ >= 0; }
    bool WriteAll(const std::vector<std::uint8_t>& bytes) const {
        for (std::size_t done = 0; done < bytes.size();) {
            const ssize_t count = write(file_, &bytes[done], bytes.size() - done);
            if (count < 0 && errno != EINTR) {
                return false;
            }
            done += static_cast<std::size_t>(count < 0 ? 0 : count);
        }
        return fsync(file_) == 0;
    }

  private:
    const int file_;
};

/// The error that is the reason, 0 for none.
int WriteFile(const std::string& fileName, const std::vector<std::uint8_t>& content) {
    const File file(fileName, O_WRONLY | O_CREAT | O_TRUNC, 0666);
    return file.IsOpen() && file.WriteAll(content) ? 0 : errno;
}

std::string NewNameOf(const std::string& fileName) {
    return fileName + ".new-" + std::to_string(getpid());
}

/// What was there, whole, or what is new, whole. As `WriteFile`.
int ReplaceFile(const std::string& fileName, const std::vector<std::uint8_t>& content) {
    const std::string newName = NewNameOf(fileName);
    int error = WriteFile(newName, content);
    if (error == 0 && std::rename(newName.c_str(), fileName.c_str()) != 0) {
        error = errno;
    }
    if (error != 0) {
        unlink(newName.c_str());
    }
    return error;
}

/// Whether a file could be replaced, as `WriteFile`; leaves it alone.
int TryToReplace(const std::string& fileName, const std::vector<std::uint8_t>& content) {
    const std::string newName = NewNameOf(fileName);
    const int error = WriteFile(newName, content);
    unlink(newName.c_str());
    return error;
}

std::string CannotWrite(const std::string& fileName, int error) {
    return "cannot write " + fileName + ": " + std::strerror(error);
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
    : loop_(pollLoop), fileName_(std::move(name)), log_(std::move(logger)) {}

EepromFile::~EepromFile() {
    loop_.Forget(saving_);
}

bool EepromFile::Exists() const {
    std::error_code error;
    return std::filesystem::exists(fileName_, error);
}

void EepromFile::Keep(std::shared_ptr<SimulatedInstrument> kept) {
    const std::vector<std::uint8_t> content = kept->Eeprom();
    const int error = Exists() ? TryToReplace(fileName_, content) : ReplaceFile(fileName_, content);
    if (error != 0) {
        throw std::runtime_error(CannotWrite(fileName_, error));
    }
    instrument_ = std::move(kept);
}

void EepromFile::MemoryChanged() {
    // An image comes in many pieces.
    constexpr std::uint64_t delay = 100'000;
    unsaved_ = true;
    if (saving_ == 0) {
        saving_ = loop_.CallAt(loop_.Now() + delay, [this] { Save(); });
    }
}

bool EepromFile::Finish() {
    if (unsaved_ && instrument_) {
        loop_.Forget(saving_);
        Save();
    }
    return !unsaved_;
}

void EepromFile::Save() {
    saving_ = 0;
    const int error = ReplaceFile(fileName_, instrument_->Eeprom());
    unsaved_ = error != 0;
    if (unsaved_ && log_) {
        log_(CannotWrite(fileName_, error));
    }
}

}  // namespace Varnholt::Simulator
