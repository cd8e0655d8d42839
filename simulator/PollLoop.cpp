#include "PollLoop.h"

#include <poll.h>

#include <algorithm>
#include <chrono>
#include <vector>

namespace Varnholt::Simulator {

std::uint64_t PollLoop::Now() {
    const auto sinceStart = std::chrono::steady_clock::now().time_since_epoch();
    return static_cast<std::uint64_t>(
        std::chrono::duration_cast<std::chrono::microseconds>(sinceStart).count());
}

PollLoop::EventId PollLoop::CallAt(std::uint64_t time, std::function<void()> event) {
    waiting.emplace(std::pair(time, ++lastId), std::move(event));
    return lastId;
}

void PollLoop::Forget(EventId id) {
    std::erase_if(waiting, [id](const auto& entry) { return entry.first.second == id; });
}

void PollLoop::Watch(int file, short events, std::function<void()> handler) {
    watches[file] = {events, std::make_shared<const std::function<void()>>(std::move(handler))};
}

void PollLoop::CallDueEvents() {
    const std::uint64_t now = Now();
    while (!stopped && !waiting.empty() && waiting.begin()->first.first <= now) {
        const std::function<void()> event = std::move(waiting.begin()->second);
        waiting.erase(waiting.begin());
        event();
    }
}

int PollLoop::MillisecondsToNextEvent() {
    constexpr std::uint64_t longest = 3'600'000;
    if (waiting.empty()) {
        return -1;
    }
    const std::uint64_t now = Now();
    const std::uint64_t time = waiting.begin()->first.first;
    return time <= now ? 0 : static_cast<int>(std::min((time - now + 999) / 1000, longest));
}

void PollLoop::Run() {
    std::vector<pollfd> files;
    while (!stopped) {
        files.clear();
        for (const auto& [file, watch] : watches) {
            files.push_back({file, watch.events, 0});
        }
        poll(files.data(), files.size(), MillisecondsToNextEvent());
        CallDueEvents();
        for (const pollfd& ready : files) {
            const auto watch = watches.find(ready.fd);
            if (ready.revents != 0 && watch != watches.end() && !stopped) {
                const auto handler = watch->second.handler;
                (*handler)();
            }
        }
    }
}

}  // namespace Varnholt::Simulator
