#include <utility>

#include "Platform/Linux/HostSignalsBlocked.h"
#include "VirtualClock.h"

namespace Varnholt::Simulator {

using namespace Platform;
using namespace Platform::Linux;

void VirtualClock::CallAt(std::uint64_t time, std::function<void()> event, const void* owner) {
    const DispatcherLock hold;
    if (!eventThread_.joinable()) {
        const HostSignalsBlocked blocked;
        threads_.reserve(threads_.size() + 1);
        eventThread_ = std::thread([this] { RunEventThread(); });
        threads_.push_back(&eventRecord_);
        eventRecord_.state = State::Blocked;
    }
    events_.emplace(time, ScheduledEvent{std::move(event), owner});
    AwaitFirstEvent();
}

void VirtualClock::Forget(const void* owner) {
    ScheduledEvents dropped;
    ThreadRecord& self = CurrentThread();
    DispatcherLock hold;
    DropEventsOf(owner, dropped);
    while (isCalling_ && ownerOfCall_ == owner && &self != &eventRecord_) {
        if (self.state == State::Running) {
            BlockedCall call(self, "the end of an event that is to be forgotten");
            forgetting_.push_back(&call);
            Block(hold, call, Never);
            std::erase(forgetting_, &call);
            if (call.hopeless) {
                return;
            }
        } else {
            hold.Wait(callEnded_, [this] { return !isCalling_; });
        }
        DropEventsOf(owner, dropped);
    }
}

void VirtualClock::DropEventsOf(const void* owner, ScheduledEvents& dropped) {
    TakeEventsOf(owner, events_, dropped);
    AwaitFirstEvent();
}

/// Lets the thread for events, unless it is busy, wait for the one that is first now.
void VirtualClock::AwaitFirstEvent() {
    if (!isCalling_) {
        eventRecord_.deadline = events_.empty() ? Never : events_.begin()->first;
    }
}

void VirtualClock::RunEventThread() {
    BindCurrentThread(&eventRecord_);
    DispatcherLock hold;
    AwaitTurn(hold, eventRecord_);
    HandOver(hold, eventRecord_);
    while (!eventThreadMustEnd_) {
        if (!events_.empty() && events_.begin()->first <= now_) {
            CallFirstEvent(hold);
        }
        eventRecord_.state = State::Blocked;
        AwaitFirstEvent();
        HandOver(hold, eventRecord_);
    }
    BindCurrentThread(nullptr);
}

void VirtualClock::CallFirstEvent(DispatcherLock& hold) {
    ScheduledEvent event = std::move(events_.extract(events_.begin()).mapped());
    isCalling_ = true;
    ownerOfCall_ = event.owner;
    hold.unlock();
    event.call();
    event.call = nullptr;
    hold.lock();
    isCalling_ = false;
    for (BlockedCall* const call : std::exchange(forgetting_, {})) {
        Wake(*call);
    }
    callEnded_.notify_all();
    WakeIfAtRest();
}

}  // namespace Varnholt::Simulator
