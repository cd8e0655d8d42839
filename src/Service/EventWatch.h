#pragma once

#include <deque>
#include <optional>
#include <vector>

#include "Platform/Handle.h"
#include "Platform/WaitableObjects.h"
#include "Service/ElapsedTime.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Service {

enum class EventKind { Button, Removed, Unknown };

/// What an instrument reported of its own accord.
struct InstrumentEvent {
    EventKind kind;
    std::uint32_t code;  ///< as the library passes it on
    double seconds;      ///< since the reader was made
};

class EventReader;

/// Takes messages on the instrument's thread and hands them to readers on their own. Any thread; outlives the
/// instrument that it listens to.
class EventMailbox final : public DeviceDriver::Generic::EventListener {
  public:
    void MessageFromDevice(std::uint32_t code, std::uint32_t detail) override;

  private:
    friend class EventReader;

    Platform::RecursiveMutex section_;  ///< guards what follows, and what the readers have waiting
    ElapsedTime time_;
    std::vector<EventReader*> readers_;
};

/// What comes into a mailbox from the reader's making on. The mailbox and the instrument that it listens to
/// outlive the reader, which one thread uses.
class EventReader final {
  public:
    EventReader(EventMailbox& mailbox, OpenedInstrument& listenedTo);
    ~EventReader();
    EventReader(const EventReader&) = delete;
    EventReader& operator=(const EventReader&) = delete;

    double Seconds() const;
    /// The next one that came, if one did. Throws when events cannot be read any more although the instrument
    /// is still connected.
    std::optional<InstrumentEvent> Next();
    /// Returns when something came since the last wait, or after that time.
    void Wait(std::uint32_t milliseconds) const { Platform::Wait(arrived_.Get(), milliseconds); }

  private:
    friend class EventMailbox;
    struct Message {
        std::uint32_t code;
        std::uint64_t milliseconds;  ///< on the mailbox's clock
    };

    double SecondsOf(std::uint64_t milliseconds) const;
    bool IsRemoved() const;

    EventMailbox& mailbox_;
    OpenedInstrument& instrument_;
    const Platform::OwnedHandle arrived_;
    std::uint64_t start_ = 0;
    std::deque<Message> waiting_;
};

}  // namespace Varnholt::Service
