#include "EepromFile.h"

#include <filesystem>
#include <utility>

#include "Utilities/Files/AtomicFile.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Simulator {

EepromFile::EepromFile(PollLoop& pollLoop, std::string name, Log logger)
    : loop_(pollLoop),
      fileName_(std::move(name)),
      log_(std::move(logger)),
      saving_(loop_, [this] { Save(); }) {}

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
    saving_.RingNoLaterThan(loop_.Now() + delay);
}

bool EepromFile::Finish() {
    if (unsaved_ && instrument_) {
        saving_.Clear();
        Save();
    }
    return !unsaved_;
}

void EepromFile::Save() {
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
