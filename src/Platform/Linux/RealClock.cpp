#include "Platform/Linux/RealClock.h"

#include <sched.h>

#include <algorithm>
#include <chrono>

#include "Platform/Linux/Immortal.h"
#include "Platform/Linux/Kernel.h"
#include "Platform/Linux/RealScheduler.h"
#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

using std::chrono::steady_clock;

namespace {

/// The death of a process changes nothing that could be awaited, so that is looked for this often.
constexpr Microseconds LongestAwait = 50'000;

}  // namespace

RealClock& RealClock::Instance() {
    static Immortal<RealClock> clock;
    return *clock;
}

Microseconds RealClock::Now() {
    const auto sinceStart = steady_clock::now().time_since_epoch();
    return static_cast<Microseconds>(std::chrono::floor<std::chrono::microseconds>(sinceStart).count());
}

WallTime RealClock::Wall() {
    const auto now = std::chrono::floor<std::chrono::milliseconds>(std::chrono::system_clock::now());
    const auto seconds = std::chrono::floor<std::chrono::seconds>(now);
    return {seconds.time_since_epoch().count(), static_cast<std::uint16_t>((now - seconds).count())};
}

EventScheduler& RealClock::Scheduler() {
    return RealScheduler::Instance();
}

/// False when there is nothing that the thread can work off.
bool RealClock::WorkOff(KernelHold& hold, BlockedCall& call, Microseconds deadline) {
    auto source = call.mayWorkOff ? call.thread.source.lock() : nullptr;
    if (!source || !source->TryEnter()) {
        return false;
    }
    call.worksOff = source;
    hold.unlock();
    source->WorkOff(deadline);
    hold.lock();
    call.worksOff = nullptr;
    return true;
}

void RealClock::Block(KernelHold& hold, BlockedCall& call, Microseconds deadline) {
    while (!call.woken && Now() < deadline && WorkOff(hold, call, deadline)) {
    }
    const auto woken = [&call] { return call.woken; };
    if (deadline == Never) {
        hold.Wait(*call.thread.turn, woken);
    } else {
        const steady_clock::time_point end{std::chrono::microseconds(deadline)};
        hold.Wait(*call.thread.turn, end, woken);
    }
}

void RealClock::Wake(BlockedCall& call) {
    call.woken = true;
    if (!call.worksOff) {
        KernelHold::RingOnRelease(call.thread.turn);
    } else if (!IsCurrentThread(call.thread)) {
        KernelHold::InterruptOnRelease(call.worksOff);
    }
}

void RealClock::BlockOnOtherProcess(KernelHold& hold, BlockedCall& call, Microseconds deadline,
                                    Microseconds period, WaitableObject* only, std::uint32_t seen) {
    const Microseconds now = Now();
    if (only && deadline > now) {
        hold.unlock();
        only->AwaitChange(seen, std::min(deadline - now, LongestAwait));
        hold.lock();
    } else {
        Block(hold, call, std::min(deadline, now + period));
    }
}

void RealClock::GiveUpSlice(KernelHold& hold) {
    hold.unlock();
    sched_yield();
    hold.lock();
}

}  // namespace Varnholt::Platform::Linux
