#pragma once

#include <memory>
#include <string>

#include "Alarm.h"
#include "PollLoop.h"
#include "SimulatedInstrument.h"
#include "TransferLog.h"

namespace Varnholt::Simulator {

/// Keeps an instrument's EEPROM in a file: written a moment after the memory changed, and at the end. The
/// file is replaced only when the new one is complete. Lives on the loop's thread.
class EepromFile final {
  public:
    /// `pollLoop` must outlive it. `logger` is told when the file cannot be written.
    EepromFile(PollLoop& pollLoop, std::string name, Log logger);
    EepromFile(const EepromFile&) = delete;
    EepromFile& operator=(const EepromFile&) = delete;

    bool Exists() const;
    /// The instrument whose memory it is, from the moment on that it exists. Throws `std::runtime_error` with
    /// a text for people when the file cannot be written; one that is there is left alone.
    void Keep(std::shared_ptr<SimulatedInstrument> kept);
    /// To be told by the instrument.
    void MemoryChanged();
    /// Writes what is not written yet; false when that cannot be done, either.
    bool Finish();

  private:
    void Save();

    PollLoop& loop_;
    const std::string fileName_;
    const Log log_;
    std::shared_ptr<SimulatedInstrument> instrument_;
    bool unsaved_ = false;
    Alarm saving_;
};

}  // namespace Varnholt::Simulator
