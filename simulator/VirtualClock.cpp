#include "VirtualClock.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>

namespace Varnholt::Simulator {

using namespace Platform;
using namespace Platform::Linux;

namespace {

/// 2020-01-01 00:00:00 UTC, so that what depends on the date is repeatable as well.
constexpr std::int64_t WallStart = 1'577'836'800;

/// One call in so many hands over although the caller could go on.
constexpr std::uint64_t CallsPerHandOver = 4;

[[noreturn]] void Abort(const std::string& report) {
    static_cast<void>(std::fprintf(stderr, "%s\n", report.c_str()));
    std::abort();
}

}  // namespace

VirtualClock::VirtualClock(std::uint64_t seed)
    : randomState_(seed), installer_(CurrentThread()), threads_{&installer_} {
    const DispatcherLock hold;
    installer_.state = State::Running;
    InstallClock(this);
}

VirtualClock::~VirtualClock() {
    ScheduledEvents dropped;
    DispatcherLock hold;
    BlockedCall call(installer_, "the end of the other threads (the clock is to end)");
    awaitingRest_ = &call;
    while (!IsAtRest() && !call.hopeless) {
        call.woken = false;
        Block(hold, call, Never);
    }
    if (call.hopeless) {
        Abort("The virtual clock ends before its threads:\n" + DescribeThreads());
    }
    dropped.swap(events_);
    installer_.state = State::Unknown;
    InstallClock(nullptr);
    eventThreadMustEnd_ = true;
    eventRecord_.state = State::Running;
    eventRecord_.turn->notify_all();
    hold.unlock();
    if (eventThread_.joinable()) {
        eventThread_.join();
    }
}

void VirtualClock::HandleDeadlock(DeadlockHandler handler) {
    const DispatcherLock hold;
    handler_ = std::move(handler);
}

WallTime VirtualClock::Wall() {
    const Microseconds elapsed = ElapsedMicroseconds();
    return {WallStart + static_cast<std::int64_t>(elapsed / 1'000'000),
            static_cast<std::uint16_t>(elapsed / 1000 % 1000)};
}

/// SplitMix64: the same numbers for a seed wherever this is built.
std::uint64_t VirtualClock::Random() {
    randomState_ += 0x9E3779B97F4A7C15u;
    std::uint64_t value = randomState_;
    value = (value ^ (value >> 30)) * 0xBF58476D1CE4E5B9u;
    value = (value ^ (value >> 27)) * 0x94D049BB133111EBu;
    return value ^ (value >> 31);
}

ThreadRecord* VirtualClock::ChooseReady() {
    const auto isReady = [](const ThreadRecord* thread) { return thread->state == State::Ready; };
    const auto count = static_cast<std::uint64_t>(std::ranges::count_if(threads_, isReady));
    if (count == 0) {
        return nullptr;
    }
    std::uint64_t skip = count == 1 ? 0 : Random() % count;
    for (ThreadRecord* const thread : threads_) {
        if (isReady(thread) && skip-- == 0) {
            return thread;
        }
    }
    return nullptr;
}

void VirtualClock::Block(DispatcherLock& hold, BlockedCall& call, Microseconds deadline) {
    ThreadRecord& self = call.thread;
    if (self.state != State::Running) {
        Abort("A thread that the virtual clock does not know wants to wait for " + call.Describe() +
              ": under this clock, threads that wait must be started by StartThread.");
    }
    self.call = &call;
    self.deadline = deadline;
    self.state = call.woken || deadline <= now_ ? State::Ready : State::Blocked;
    HandOver(hold, self);
    self.call = nullptr;
    self.deadline = Never;
}

void VirtualClock::Wake(BlockedCall& call) {
    call.woken = true;
    if (call.thread.state == State::Blocked && call.thread.call == &call) {
        call.thread.state = State::Ready;
    }
}

/// The other process lives in real time: as much of it passes as the wait takes of ours.
void VirtualClock::BlockOnOtherProcess(DispatcherLock& hold, BlockedCall& call, Microseconds deadline,
                                       Microseconds period, ChangeCount* /*changes*/,
                                       std::uint32_t /*seen*/) {
    Block(hold, call, std::min(deadline, now_ + period));
    if (!call.woken) {
        hold.unlock();
        usleep(static_cast<useconds_t>(period));
        hold.lock();
    }
}

/// Called by a thread that gave up being `Running`; returns once it is again.
void VirtualClock::HandOver(DispatcherLock& hold, ThreadRecord& self) {
    while (self.state != State::Running) {
        ThreadRecord* const next = ChooseReady();
        if (!next) {
            Advance(hold);
            continue;
        }
        next->state = State::Running;
        if (next != &self) {
            next->turn->notify_all();
            AwaitTurn(hold, self);
        }
    }
}

void VirtualClock::AwaitTurn(DispatcherLock& hold, ThreadRecord& self) {
    hold.Wait(*self.turn, [&self] { return self.state == State::Running || self.mustAdvance; });
    self.mustAdvance = false;
}

void VirtualClock::Preempt(DispatcherLock& hold) {
    ThreadRecord& self = CurrentThread();
    if (self.state != State::Running || !std::ranges::any_of(threads_, [](const ThreadRecord* thread) {
            return thread->state == State::Ready;
        })) {
        return;
    }
    if (Random() % CallsPerHandOver == 0) {
        self.state = State::Ready;
        HandOver(hold, self);
    }
}

void VirtualClock::GiveUpSlice(DispatcherLock& hold) {
    ThreadRecord& self = CurrentThread();
    if (self.state != State::Running) {
        return;
    }
    ThreadRecord* const next = ChooseReady();
    if (next) {
        self.state = State::Ready;
        next->state = State::Running;
        next->turn->notify_all();
        AwaitTurn(hold, self);
        HandOver(hold, self);
    } else {
        BlockedCall call(self, "its next time slice");
        Block(hold, call, now_ + 1);
    }
}

/// Nobody can run at the present time, which therefore ends.
void VirtualClock::Advance(DispatcherLock& hold) {
    Microseconds next = Never;
    for (const ThreadRecord* const thread : threads_) {
        if (thread->state == State::Blocked) {
            next = std::min(next, thread->deadline);
        }
    }
    if (next == Never) {
        ReportDeadlock(hold);
        return;
    }
    now_ = std::max(next, now_.load());
    for (ThreadRecord* const thread : threads_) {
        if (thread->state == State::Blocked && thread->deadline <= now_) {
            thread->state = State::Ready;
        }
    }
}

/// The calling thread ends, and leaves the others to themselves. If nobody is ready, one of them is to move
/// the time on; the installer at least is blocked.
void VirtualClock::PassOn() {
    if (ThreadRecord* const next = ChooseReady()) {
        next->state = State::Running;
        next->turn->notify_all();
        return;
    }
    const auto blocked = std::ranges::find(threads_, State::Blocked, &ThreadRecord::state);
    (*blocked)->mustAdvance = true;
    (*blocked)->turn->notify_all();
}

void VirtualClock::ThreadMade(DispatcherLock& /*hold*/, ThreadRecord& thread) {
    thread.state = State::Ready;
    threads_.push_back(&thread);
}

void VirtualClock::ThreadBegins(DispatcherLock& hold, ThreadRecord& thread) {
    if (thread.state != State::Unknown) {
        AwaitTurn(hold, thread);
    }
}

void VirtualClock::ThreadNeverBegan(DispatcherLock& /*hold*/, ThreadRecord& thread) {
    std::erase(threads_, &thread);
}

void VirtualClock::ThreadEnds(DispatcherLock& /*hold*/, ThreadRecord& thread) {
    if (thread.state == State::Unknown) {
        return;  // of the time before the clock
    }
    thread.state = State::Unknown;
    std::erase(threads_, &thread);
    WakeIfAtRest();
    PassOn();
}

/// Only the clock's maker is left, and the thread for events, which has nothing to do.
bool VirtualClock::IsAtRest() const {
    return threads_.size() == (eventThread_.joinable() ? 2 : 1) && !isCalling_;
}

void VirtualClock::WakeIfAtRest() {
    if (awaitingRest_ && IsAtRest()) {
        Wake(*awaitingRest_);
    }
}

void VirtualClock::ReportDeadlock(DispatcherLock& hold) {
    const std::string report = "Deadlock: every thread waits and nothing can wake it.\n" + DescribeThreads();
    const DeadlockHandler handle = handler_;
    if (!handle) {
        Abort(report);
    }
    hold.unlock();
    handle(report);
    hold.lock();
    for (ThreadRecord* const thread : threads_) {
        if (thread->state == State::Blocked && thread->call) {
            thread->call->hopeless = true;
            thread->state = State::Ready;
        }
    }
}

std::string VirtualClock::DescribeThreads() const {
    std::string text;
    for (const ThreadRecord* const thread : threads_) {
        if (thread == &eventRecord_ && !isCalling_) {
            continue;
        }
        text += thread == &eventRecord_ ? "  the event that is running"
                                        : "  thread " + std::to_string(thread->number);
        text += thread == &installer_ ? " (made the clock)" : "";
        text += (thread->call ? " waits for " + thread->call->Describe() : " could run") + "\n";
    }
    return text;
}

}  // namespace Varnholt::Simulator
