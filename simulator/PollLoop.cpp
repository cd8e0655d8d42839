#include "PollLoop.h"

#include <poll.h>

#include <algorithm>
#include <vector>

namespace Varnholt::Simulator {

void PollLoop::CallAt(std::uint64_t time, std::function<void()> event, const void* owner) {
    waiting_.emplace(time, Platform::ScheduledEvent{std::move(event), owner});
}

void PollLoop::Forget(const void* owner) {
    Platform::ScheduledEvents dropped;
    TakeEventsOf(owner, waiting_, dropped);
}

void PollLoop::Watch(int file, short events, std::function<void()> handler) {
    watches_[file] = {events, std::make_shared<const std::function<void()>>(std::move(handler))};
}

void PollLoop::CallDueEvents() {
    const std::uint64_t now = Now();
    while (!stopped_ && !waiting_.empty() && waiting_.begin()->first <= now) {
        waiting_.extract(waiting_.begin()).mapped().call();
    }
}

int PollLoop::MillisecondsToNextEvent() {
    constexpr std::uint64_t longest = 3'600'000;
    if (waiting_.empty()) {
        return -1;
    }
    const std::uint64_t now = Now();
    const std::uint64_t time = waiting_.begin()->first;
    return time <= now ? 0 : static_cast<int>(std::min((time - now + 999) / 1000, longest));
}

void PollLoop::Run() {
    std::vector<pollfd> files;
    while (!stopped_) {
        files.clear();
        for (const auto& [file, watch] : watches_) {
            files.push_back({file, watch.events, 0});
        }
        poll(files.data(), files.size(), MillisecondsToNextEvent());
        CallDueEvents();
        for (const pollfd& ready : files) {
            const auto watch = watches_.find(ready.fd);
            if (ready.revents != 0 && watch != watches_.end() && !stopped_) {
                const auto handler = watch->second.handler;
                (*handler)();
            }
        }
    }
}

}  // namespace Varnholt::Simulator
