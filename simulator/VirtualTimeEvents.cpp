#include <algorithm>

#include "Platform/ErrorCodes.h"
#include "Platform/Linux/HostSignalsBlocked.h"
#include "Platform/RealScheduler.h"
#include "VirtualTime.h"

namespace Varnholt::Simulator {

using namespace Platform;
using namespace Platform::Linux;

namespace {

class WaitingForEvent final : public BlockedCall {
  public:
    using BlockedCall::BlockedCall;
    std::string Describe() const override { return "the end of an event that is to be forgotten"; }
};

}  // namespace

EventScheduler::EventId VirtualTime::CallAt(std::uint64_t time, std::function<void()> event) {
    const EventId id = NewEventId();
    const DispatcherLock hold;
    events_.emplace(std::pair(time, id), std::move(event));
    return id;
}

void VirtualTime::Forget(EventId id) {
    std::function<void()> dropped;
    ThreadRecord& self = CurrentThread();
    DispatcherLock hold;
    const auto found =
        std::ranges::find_if(events_, [id](const auto& waiting) { return waiting.first.second == id; });
    if (found != events_.end()) {
        dropped = std::move(found->second);
        events_.erase(found);
    } else if (running_ == id && &self != runningAs_) {
        if (self.state == State::Running) {
            WaitingForEvent call(self);
            forgetting_.push_back(&call);
            Block(hold, call, Never);
            std::erase(forgetting_, &call);
        } else {
            hold.Wait(eventEnded_, [this, id] { return running_ != id; });
        }
    }
    hold.unlock();
}

bool VirtualTime::CanHost(const ThreadRecord& thread) {
    if (thread.owned.empty() && thread.recursiveMutexesHeld == 0) {
        return true;
    }
    // Without the thread for events, one that needs a lock of its host is reported as a deadlock; nothing
    // worse.
    if (!hasEventThread_) {
        const HostSignalsBlocked blocked;
        hasEventThread_ = pthread_create(&systemEventThread_, nullptr, RunEventThread, this) == 0;
    }
    return !hasEventThread_;
}

void VirtualTime::HostEvent(DispatcherLock& hold, ThreadRecord& host) {
    const ErrorCode errorOfHost = LastError();
    host.state = State::Hosting;
    BindCurrentThread(&hostedEvent_);
    CallEvent(hold, hostedEvent_);
    BindCurrentThread(&host);
    host.state = IsDue(host) ? State::Ready : State::Blocked;
    SetLastError(errorOfHost);
}

/// Calls the first event on the stack of the calling thread, which then has the baton still.
void VirtualTime::CallEvent(DispatcherLock& hold, ThreadRecord& as) {
    const auto first = events_.begin();
    running_ = first->first.second;
    runningAs_ = &as;
    std::function<void()> event = std::move(first->second);
    events_.erase(first);
    as.state = State::Running;
    hold.unlock();
    event();
    event = nullptr;
    hold.lock();
    as.state = State::Unknown;
    running_ = 0;
    runningAs_ = nullptr;
    for (BlockedCall* const call : std::exchange(forgetting_, {})) {
        Wake(*call);
    }
    eventEnded_.notify_all();
}

void* VirtualTime::RunEventThread(void* time) {
    DispatcherLock hold;
    static_cast<VirtualTime*>(time)->ServeEvents(hold);
    return nullptr;
}

void VirtualTime::ServeEvents(DispatcherLock& hold) {
    BindCurrentThread(&eventThread_);
    while (true) {
        hold.Wait(*eventThread_.turn, [this] { return eventThreadMustCall_ || eventThreadMustEnd_; });
        if (eventThreadMustEnd_) {
            BindCurrentThread(nullptr);
            return;
        }
        eventThreadMustCall_ = false;
        CallEvent(hold, eventThread_);
        PassOn();
    }
}

}  // namespace Varnholt::Simulator
