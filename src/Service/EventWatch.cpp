#include "Service/EventWatch.h"

#include <algorithm>
#include <mutex>

namespace Varnholt::Service {
namespace {

constexpr std::uint32_t LookInterval = 20;  // milliseconds
/// A system may list an instrument for a moment after it has gone.
constexpr int LooksForAGoneOne = 50;

}  // namespace

void EventWatch::Mailbox::MessageFromDevice(std::uint32_t code, std::uint32_t) {
    const std::lock_guard holder(section_);
    waiting_.push_back({code, time_.Milliseconds()});
}

std::uint64_t EventWatch::Mailbox::Now() {
    const std::lock_guard holder(section_);
    return time_.Milliseconds();
}

std::optional<EventWatch::Mailbox::Message> EventWatch::Mailbox::Take() {
    const std::lock_guard holder(section_);
    if (waiting_.empty()) {
        return std::nullopt;
    }
    const Message first = waiting_.front();
    waiting_.pop_front();
    return first;
}

EventWatch::EventWatch(Context& context, const FoundInstrument& found)
    : instrument_(context, found, &messages_),
      deferral_(context.UserInterruption()),
      start_(messages_.Now()) {}

double EventWatch::SecondsOf(std::uint64_t milliseconds) const {
    return static_cast<double>(std::max(milliseconds, start_) - start_) / 1000;
}

std::optional<InstrumentEvent> EventWatch::Next() {
    const auto message = messages_.Take();
    if (!message) {
        return std::nullopt;
    }
    InstrumentEvent event{EventKind::Unknown, message->code, SecondsOf(message->milliseconds)};
    if (message->code == DeviceDriver::Generic::MessageButtonData) {
        event.kind = EventKind::Button;
    } else if (message->code == DeviceDriver::Generic::MessageDeviceGone) {
        if (!IsRemoved()) {
            throw Failure(FailureKind::TransferFailed, "its events could not be read any more",
                          "it is still connected: watch it again")
                .Of(Identifier());
        }
        event.kind = EventKind::Removed;
    }
    return event;
}

/// The end of the messages looks like a removal, whatever ended them.
bool EventWatch::IsRemoved() {
    for (int look = 0; look < LooksForAGoneOne; ++look) {
        if (!IsConnected(instrument_.UsedContext(), Identifier())) {
            return true;
        }
        if (!instrument_.UsedContext().UserInterruption().Sleep(LookInterval)) {
            break;
        }
    }
    return false;
}

}  // namespace Varnholt::Service
