#pragma once

#include <deque>
#include <optional>

#include "Platform/WaitableObjects.h"
#include "Service/ElapsedTime.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Service {

enum class EventKind { Button, Removed, Unknown };

/// What an instrument reported of its own accord.
struct InstrumentEvent {
    EventKind kind;
    std::uint32_t code;  ///< as the library passes it on
    double seconds;      ///< since the watch began
};

/// Watches the button and the removal of an instrument, which it opens. The user's wish to end does not cut
/// off its transfers: aborted pipes would look like an instrument that is gone.
class EventWatch final {
  public:
    EventWatch(Context& context, const FoundInstrument& found);

    const std::string& Identifier() const { return instrument_.Identifier(); }
    double Seconds() { return SecondsOf(messages_.Now()); }
    /// The next one that came, if one did. Throws when events cannot be read any more although the instrument
    /// is still connected.
    std::optional<InstrumentEvent> Next();

  private:
    /// Takes messages on the instrument's thread and hands them to the watch's.
    class Mailbox final : public DeviceDriver::Generic::EventListener {
      public:
        struct Message {
            std::uint32_t code;
            std::uint64_t milliseconds;  ///< on the mailbox's clock
        };

        void MessageFromDevice(std::uint32_t code, std::uint32_t detail) override;
        std::uint64_t Now();
        std::optional<Message> Take();

      private:
        Platform::RecursiveMutex section_;  ///< guards what follows
        ElapsedTime time_;
        std::deque<Message> waiting_;
    };

    double SecondsOf(std::uint64_t milliseconds) const;
    bool IsRemoved();

    Mailbox messages_;
    OpenedInstrument instrument_;
    const Interruption::Deferral deferral_;
    const std::uint64_t start_;
};

}  // namespace Varnholt::Service
