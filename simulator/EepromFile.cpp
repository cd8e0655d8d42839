#include "EepromFile.h"

#include <filesystem>
#include <stdexcept>
#include <utility>

#include "Protocol/Instrument.h"
#include "Utilities/Files/AtomicFile.h"
#include "Utilities/Files/ByteSource.h"
#include "Utilities/Files/FileError.h"

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
    const bool isThere = Exists();
    Utilities::Files::AtomicFile file(fileName_);
    file.Write(kept->Eeprom());
    isThere ? file.Prepare() : file.Commit();
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
    try {
        Utilities::Files::WriteFileAtomically(fileName_, instrument_->Eeprom());
        unsaved_ = false;
    } catch (const Utilities::Files::FileError& error) {
        unsaved_ = true;
        if (log_) {
            log_(error.what());
        }
    }
}

}  // namespace Varnholt::Simulator
