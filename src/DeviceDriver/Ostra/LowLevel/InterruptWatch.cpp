#include "DeviceDriver/Ostra/LowLevel/InterruptWatch.h"

#include "Platform/Threads.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Generic::EventListener;
using Platform::WaitResult;
using Varnholt::Utilities::Multithreading::ScopedLock;

namespace {

constexpr std::uint32_t StartLimit = 2000;
constexpr int StopRounds = 10;
constexpr std::uint32_t StopRoundLimit = 1000;
constexpr std::uint32_t ForcedExitCode = 0xFFFFFFFF;

bool HasEnded(Platform::Handle thread, std::uint32_t limit) {
    const WaitResult waited = Platform::Wait(thread, limit);
    return waited == WaitResult::Signalled || waited == WaitResult::Abandoned;
}

}  // namespace

bool InterruptWatch::HasEvents() const {
    return started && wake;
}

void InterruptWatch::SetReceiver(std::shared_ptr<EventListener> receiver) {
    const ScopedLock held(lock);
    listener.swap(receiver);
}

bool InterruptWatch::IsTouched() {
    const ScopedLock held(lock);
    return touched;
}

InterruptWatch::State InterruptWatch::GetState() {
    const ScopedLock held(lock);
    return state;
}

bool InterruptWatch::IsOwnThread() {
    const ScopedLock held(lock);
    return threadId == std::this_thread::get_id();
}

bool InterruptWatch::WasEndedByForce() {
    const ScopedLock held(lock);
    return endedByForce;
}

Platform::OwnedHandle InterruptWatch::Launch() {
    if (!HasEvents()) {
        return {};
    }
    auto argument = std::make_unique<std::shared_ptr<InterruptWatch>>(shared_from_this());
    const ScopedLock held(lock);  // the thread finds its state set
    Platform::OwnedHandle thread(Platform::StartThread(ThreadEntry, argument.get()));
    if (thread) {
        state = State::Running;
        static_cast<void>(argument.release());  // the thread's
    }
    return thread;
}

bool InterruptWatch::AwaitStart() {
    return Platform::Wait(started.Get(), StartLimit) == WaitResult::Signalled;
}

void InterruptWatch::RequestStop() {
    const ScopedLock held(lock);
    if (state == State::Running) {
        state = State::StopRequested;
    }
    endRequested = true;
    // Cancelling from here would not reach the read, which is the thread's: woken, it cancels it itself.
    Platform::SignalEvent(wake.Get());
}

bool InterruptWatch::End(Platform::OwnedHandle& thread) {
    if (IsOwnThread()) {
        RequestStop();
        thread.Reset();
        return true;
    }
    bool ended = false;
    for (int round = 0; round < StopRounds && !ended && GetState() != State::Ended; ++round) {
        RequestStop();
        Platform::SleepMilliseconds(0);
        ended = HasEnded(thread.Get(), StopRoundLimit);
    }
    if (!ended) {
        if (GetState() != State::Ended) {
            ClosePipe();
        }
        ended = HasEnded(thread.Get(), StopRoundLimit) || EndByForce(thread.Get());
    }
    thread.Reset();
    return ended;
}

bool InterruptWatch::EndByForce(Platform::Handle thread) {
    std::shared_ptr<EventListener> dropped;
    const ScopedLock held(lock);  // so that the thread does not hold it
    dropped.swap(listener);
    endedByForce = Platform::EndThreadByForce(thread, ForcedExitCode);
    return endedByForce;
}

std::uint32_t InterruptWatch::ThreadEntry(void* argument) {
    const std::unique_ptr<std::shared_ptr<InterruptWatch>> own(
        static_cast<std::shared_ptr<InterruptWatch>*>(argument));
    try {
        (*own)->Run();
    } catch (...) {  // the lock itself failed
    }
    return 0;
}

void InterruptWatch::Run() {
    {
        const ScopedLock held(lock);
        threadId = std::this_thread::get_id();
    }
    try {
        Listen();
    } catch (...) {  // whatever it was, it ends the thread
    }
    const ScopedLock held(lock);
    state = State::Ended;
    threadId = {};
}

void InterruptWatch::ReportStart() {
    Platform::SignalEvent(started.Get());
    Platform::SleepMilliseconds(0);
}

void InterruptWatch::DispatchEvent(std::uint32_t count) {
    std::shared_ptr<EventListener> receiver;
    {
        const ScopedLock held(lock);
        if (count != 0) {
            touched = true;
        }
        if (count != 0 || state == State::Running) {
            receiver = listener;
        }
    }
    if (receiver) {
        receiver->MessageFromDevice(count != 0 ? Generic::MessageButtonData : Generic::MessageDeviceGone, 0);
    }
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
