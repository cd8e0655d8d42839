#include <algorithm>

#include "Platform/ErrorCodes.h"
#include "Platform/Posix/RealScheduler.h"
#include "Platform/Posix/SystemThread.h"
#include "VirtualTime.h"

namespace Varnholt::Simulator {

using namespace Platform;
using namespace Platform::Posix;

namespace {

class WaitingForEvent final : public BlockedCall {
  public:
    using BlockedCall::BlockedCall;
    std::string Describe() const override { return "the end of an event that is to be forgotten"; }
};

}  // namespace

EventScheduler::EventId VirtualTime::CallAt(std::uint64_t time, std::function<void()> event) {
    const EventId id = NewEventId();
    const KernelHold hold;
    events.emplace(std::pair(time, id), std::move(event));
    return id;
}

void VirtualTime::Forget(EventId id) {
    std::function<void()> dropped;
    ThreadRecord& self = CurrentThread();
    KernelHold hold;
    const auto found =
        std::ranges::find_if(events, [id](const auto& waiting) { return waiting.first.second == id; });
    if (found != events.end()) {
        dropped = std::move(found->second);
        events.erase(found);
    } else if (running == id && &self != runningAs) {
        if (self.state == State::Running) {
            WaitingForEvent call(self);
            forgetting.push_back(&call);
            Block(hold, call, Never);
            std::erase(forgetting, &call);
        } else {
            hold.Wait(eventEnded, [this, id] { return running != id; });
        }
    }
    hold.unlock();
}

bool VirtualTime::CanHost(const ThreadRecord& thread) {
    if (thread.owned.empty() && thread.sectionsHeld == 0) {
        return true;
    }
    // Without the thread for events, one that needs a lock of its host is reported as a deadlock; nothing
    // worse.
    hasEventThread = hasEventThread || StartSystemThread(systemEventThread, RunEventThread, this);
    return !hasEventThread;
}

void VirtualTime::HostEvent(KernelHold& hold, ThreadRecord& host) {
    const ErrorCode errorOfHost = LastError();
    host.state = State::Hosting;
    BindCurrentThread(&hostedEvent);
    CallEvent(hold, hostedEvent);
    BindCurrentThread(&host);
    host.state = IsDue(host) ? State::Ready : State::Blocked;
    SetLastError(errorOfHost);
}

/// Calls the first event on the stack of the calling thread, which then has the baton still.
void VirtualTime::CallEvent(KernelHold& hold, ThreadRecord& as) {
    const auto first = events.begin();
    running = first->first.second;
    runningAs = &as;
    std::function<void()> event = std::move(first->second);
    events.erase(first);
    as.state = State::Running;
    hold.unlock();
    event();
    event = nullptr;
    hold.lock();
    as.state = State::Unknown;
    running = 0;
    runningAs = nullptr;
    for (BlockedCall* const call : std::exchange(forgetting, {})) {
        Wake(*call);
    }
    eventEnded.notify_all();
}

void* VirtualTime::RunEventThread(void* time) {
    KernelHold hold;
    static_cast<VirtualTime*>(time)->ServeEvents(hold);
    return nullptr;
}

void VirtualTime::ServeEvents(KernelHold& hold) {
    BindCurrentThread(&eventThread);
    while (true) {
        hold.Wait(*eventThread.turn, [this] { return eventThreadMustCall || eventThreadMustEnd; });
        if (eventThreadMustEnd) {
            BindCurrentThread(nullptr);
            return;
        }
        eventThreadMustCall = false;
        CallEvent(hold, eventThread);
        PassOn();
    }
}

}  // namespace Varnholt::Simulator
