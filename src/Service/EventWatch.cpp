#include "Service/EventWatch.h"

#include <mutex>

namespace Varnholt::Service {
namespace {

constexpr std::uint32_t LookInterval = 20;  // milliseconds
/// A system may list an instrument for a moment after it has gone.
constexpr int LooksForAGoneOne = 50;

}  // namespace

void EventMailbox::MessageFromDevice(std::uint32_t code, std::uint32_t) {
    const std::lock_guard holder(section_);
    for (EventReader* const reader : readers_) {
        reader->waiting_.push_back({code, time_.Milliseconds()});
        Platform::SignalEvent(reader->arrived_.Get());
    }
}

EventReader::EventReader(EventMailbox& mailbox, OpenedInstrument& listenedTo)
    : mailbox_(mailbox), instrument_(listenedTo), arrived_(Platform::MakeAutoResetEvent()) {
    const std::lock_guard holder(mailbox_.section_);
    start_ = mailbox_.time_.Milliseconds();
    mailbox_.readers_.push_back(this);
}

EventReader::~EventReader() {
    const std::lock_guard holder(mailbox_.section_);
    std::erase(mailbox_.readers_, this);
}

double EventReader::Seconds() const {
    const std::lock_guard holder(mailbox_.section_);
    return SecondsOf(mailbox_.time_.Milliseconds());
}

double EventReader::SecondsOf(std::uint64_t milliseconds) const {
    return static_cast<double>(milliseconds - start_) / 1000;
}

std::optional<InstrumentEvent> EventReader::Next() {
    InstrumentEvent event{EventKind::Unknown, 0, 0};
    {
        const std::lock_guard holder(mailbox_.section_);
        if (waiting_.empty()) {
            return std::nullopt;
        }
        event.code = waiting_.front().code;
        event.seconds = SecondsOf(waiting_.front().milliseconds);
        waiting_.pop_front();
    }
    if (event.code == DeviceDriver::Generic::MessageButtonData) {
        event.kind = EventKind::Button;
    } else if (event.code == DeviceDriver::Generic::MessageDeviceGone) {
        if (!IsRemoved()) {
            throw Failure(FailureKind::TransferFailed, "its events could not be read any more",
                          "it is still connected: watch it again")
                .Of(instrument_.Identifier());
        }
        event.kind = EventKind::Removed;
    }
    return event;
}

/// The end of the messages looks like a removal, whatever ended them.
bool EventReader::IsRemoved() const {
    for (int look = 0; look < LooksForAGoneOne; ++look) {
        if (!IsConnected(instrument_.UsedContext(), instrument_.Identifier())) {
            return true;
        }
        if (!instrument_.UsedContext().UserInterruption().Sleep(LookInterval)) {
            break;
        }
    }
    return false;
}

}  // namespace Varnholt::Service
