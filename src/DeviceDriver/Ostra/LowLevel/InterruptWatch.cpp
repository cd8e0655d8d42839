#include "DeviceDriver/Ostra/LowLevel/InterruptWatch.h"

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
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
    return started_ && wake_;
}

void InterruptWatch::SetReceiver(std::shared_ptr<EventListener> receiver) {
    const ScopedLock held(lock_);
    listener_.swap(receiver);
}

void InterruptWatch::Start(Platform::OwnedHandle& thread, const SourceLocation& caller) {
    if (thread) {
        return;
    }
    if (HasEvents()) {
        auto argument = std::make_unique<std::shared_ptr<InterruptWatch>>(shared_from_this());
        const ScopedLock held(lock_);  // the thread finds its state set
        thread = Platform::OwnedHandle(Platform::StartThread(ThreadEntry, argument.get()));
        if (thread) {
            state_ = State::Running;
            static_cast<void>(argument.release());  // the thread's
        }
    }
    if (!thread) {
        throw IOException("could not create interrupt listener thread", Here(caller));
    }
    if (Platform::Wait(started_.Get(), StartLimit) != WaitResult::Signalled) {
        throw IOException("interrupt listener thread had timeout", Here(caller));
    }
}

void InterruptWatch::RequestStop() {
    const ScopedLock held(lock_);
    if (state_ == State::Running) {
        state_ = State::StopRequested;
    }
    endRequested_ = true;
    // Cancelling from here would not reach the read, which is the thread's: woken, it cancels it itself.
    Platform::SignalEvent(wake_.Get());
}

bool InterruptWatch::End(Platform::OwnedHandle& thread) {
    if (threadId_ == std::this_thread::get_id()) {
        RequestStop();
        thread.Reset();
        return true;
    }
    bool ended = false;
    for (int round = 0; round < StopRounds && !ended && state_ != State::Ended; ++round) {
        RequestStop();
        Platform::SleepMilliseconds(0);
        ended = HasEnded(thread.Get(), StopRoundLimit);
    }
    if (!ended) {
        if (state_ != State::Ended) {
            ClosePipe();
        }
        ended = HasEnded(thread.Get(), StopRoundLimit) || EndByForce(thread.Get());
    }
    thread.Reset();
    return ended;
}

bool InterruptWatch::EndByForce(Platform::Handle thread) {
    std::shared_ptr<EventListener> dropped;
    const ScopedLock held(lock_);  // so that the thread does not hold it
    dropped.swap(listener_);
    endedByForce_ = Platform::EndThreadByForce(thread, ForcedExitCode);
    return endedByForce_;
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
        const ScopedLock held(lock_);
        threadId_ = std::this_thread::get_id();
    }
    try {
        Listen();
    } catch (...) {  // whatever it was, it ends the thread
    }
    const ScopedLock held(lock_);
    state_ = State::Ended;
    threadId_ = std::thread::id();
}

void InterruptWatch::ReportStart() {
    Platform::SignalEvent(started_.Get());
    Platform::SleepMilliseconds(0);
}

void InterruptWatch::DispatchEvent(std::uint32_t count) {
    std::shared_ptr<EventListener> receiver;
    {
        const ScopedLock held(lock_);
        if (count != 0) {
            touched_ = true;
        }
        if (count != 0 || state_ == State::Running) {
            receiver = listener_;
        }
    }
    if (receiver) {
        receiver->MessageFromDevice(count != 0 ? Generic::MessageButtonData : Generic::MessageDeviceGone, 0);
    }
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
