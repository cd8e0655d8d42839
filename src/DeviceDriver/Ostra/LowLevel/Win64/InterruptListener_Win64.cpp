#include "DeviceDriver/Ostra/LowLevel/Win64/InterruptListener_Win64.h"

#include <list>
#include <thread>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Utilities/Exceptions/Location.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using namespace Protocol::UsbIoDriver;
using Generic::EventListener;
using Generic::Utilities::IOException;
using Platform::WaitResult;
using UsbIo::CUsbIoPipe;
using Varnholt::Utilities::Exceptions::Here;
using Varnholt::Utilities::Multithreading::Mutex;
using Varnholt::Utilities::Multithreading::ScopedLock;
using Varnholt::Utilities::Tools::SmartPointer;

namespace {

constexpr std::uint32_t StartLimit = 2000;
constexpr std::uint32_t StaleReadLimit = 10;
constexpr std::uint32_t ReadLimit = 1000;
constexpr int StopRounds = 10;
constexpr std::uint32_t StopRoundLimit = 1000;
constexpr std::uint32_t ForcedExitCode = 0xFFFFFFFF;

bool HasEnded(Platform::Handle thread, std::uint32_t limit) {
    const WaitResult waited = Platform::Wait(thread, limit);
    return waited == WaitResult::Signalled || waited == WaitResult::Abandoned;
}

/// For a thread that could not be ended: whenever it comes back, it must find its (closed) pipe. It cannot
/// own it, because the pointer's count is not for two threads.
void KeepForever(const SmartPointer<CUsbIoPipe>& pipe) {
    static auto* const kept = new std::list<SmartPointer<CUsbIoPipe>>;
    kept->push_back(pipe);
}

}  // namespace

/// What the thread works on. The thread and the listener own it together, so that a thread that could not be
/// ended finds its things in place however late it comes back.
///
/// Lock order: `deliveryLock`, then `lock`. A message is delivered under `deliveryLock` alone, so that a
/// receiver that does not return holds up whoever takes it away, but not `Stop`.
class InterruptListener_Win64::Watch final {
  public:
    enum class State { Running, StopRequested, Ended };

    void SetReceiver(EventListener* receiver) {
        if (WasEndedByForce()) {
            return;  // no message can be under way, and nobody may be left to free the lock
        }
        const ScopedLock delivering(deliveryLock);
        const ScopedLock held(lock);
        listener = receiver;
    }
    bool IsTouched() {
        const ScopedLock held(lock);
        return touched;
    }
    State GetState() {
        const ScopedLock held(lock);
        return state;
    }
    bool IsOwnThread() {
        const ScopedLock held(lock);
        return threadId == std::this_thread::get_id();
    }

    Platform::OwnedHandle Launch(CUsbIoPipe* boundPipe, Platform::ThreadEntry entry, void* argument) {
        if (!started || !wake) {
            return {};
        }
        const ScopedLock held(lock);  // the thread finds its state set
        pipe = boundPipe;
        Platform::OwnedHandle thread(Platform::StartThread(entry, argument));
        if (thread) {
            state = State::Running;
        }
        return thread;
    }
    bool AwaitStart() { return Platform::Wait(started.Get(), StartLimit) == WaitResult::Signalled; }
    void RequestStop() {
        const ScopedLock held(lock);
        state = State::StopRequested;
        // Cancelling from here would not reach the read, which is the thread's: woken, it cancels it itself.
        Platform::SignalEvent(wake.Get());
    }
    /// True when the thread runs no further instruction; it holds at most `deliveryLock` then.
    bool EndByForce(Platform::Handle thread) {
        const ScopedLock held(lock);
        listener = nullptr;
        endedByForce = Platform::EndThreadByForce(thread, ForcedExitCode);
        return endedByForce;
    }
    bool WasEndedByForce() {
        const ScopedLock held(lock);
        return endedByForce;
    }

    void Run() {
        try {
            Listen();
        } catch (...) {  // whatever it was, it ends the thread
        }
        const ScopedLock held(lock);
        state = State::Ended;
    }

  private:
    enum class Outcome { Nothing, Data, Failed };

    void Listen();
    Outcome Read(std::uint32_t limit);
    void DispatchEvent(std::uint32_t count);

    Mutex deliveryLock{""};
    Mutex lock{""};
    const Platform::OwnedHandle started{Platform::MakeAutoResetEvent()};
    const Platform::OwnedHandle wake{Platform::MakeAutoResetEvent()};
    CUsbIoPipe* pipe = nullptr;  ///< set before the thread starts
    // Guarded by `lock`:
    State state = State::Ended;
    bool touched = false;
    bool endedByForce = false;
    EventListener* listener = nullptr;
    std::thread::id threadId;
};

void InterruptListener_Win64::Watch::Listen() {
    {
        const ScopedLock held(lock);
        threadId = std::this_thread::get_id();
    }
    Platform::SignalEvent(started.Get());
    Platform::SleepMilliseconds(0);
    Read(StaleReadLimit);  // an interrupt left from before is thrown away
    while (GetState() == State::Running) {
        const Outcome outcome = Read(ReadLimit);
        if (outcome != Outcome::Nothing) {
            DispatchEvent(outcome == Outcome::Data ? 1 : 0);
        }
        if (outcome == Outcome::Failed) {
            break;
        }
    }
}

InterruptListener_Win64::Watch::Outcome InterruptListener_Win64::Watch::Read(std::uint32_t limit) {
    std::uint8_t data = 0;
    std::uint32_t size = sizeof(data);
    const std::uint32_t status = pipe->ReadSyncUntil(&data, size, limit, wake.Get());
    // A read that was given up can have moved its byte all the same, and the button is not pressed twice.
    if (status == Status::Success || size > 0) {
        return Outcome::Data;
    }
    return status == Status::TimedOut || status == Status::UserEvent ? Outcome::Nothing : Outcome::Failed;
}

void InterruptListener_Win64::Watch::DispatchEvent(std::uint32_t count) {
    const ScopedLock delivering(deliveryLock);
    EventListener* receiver = nullptr;
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

InterruptListener_Win64::InterruptListener_Win64(const std::string&) try : watch(std::make_shared<Watch>()) {}
TRACED

InterruptListener_Win64::~InterruptListener_Win64() {
    try {
        Stop();
    } catch (...) {  // nobody is left to tell
    }
}

void InterruptListener_Win64::SetListener(EventListener* receiver) try { watch->SetReceiver(receiver); }
TRACED

void InterruptListener_Win64::ClearListener() try { watch->SetReceiver(nullptr); }
TRACED

void InterruptListener_Win64::SetPipe(const SmartPointer<CUsbIoPipe>& boundPipe) try { pipe = boundPipe; }
TRACED

bool InterruptListener_Win64::IsTouched() const try { return watch->IsTouched(); }
TRACED

void InterruptListener_Win64::Start() try {
    auto argument = std::make_unique<std::shared_ptr<Watch>>(watch);
    thread = watch->Launch(&*pipe, ThreadEntry, argument.get());
    if (!thread) {
        throw IOException("could not create interrupt listener thread", Here());
    }
    static_cast<void>(argument.release());  // the thread's
    if (!watch->AwaitStart()) {
        throw IOException("interrupt listener thread had timeout", Here());
    }
}
TRACED

std::uint32_t InterruptListener_Win64::ThreadEntry(void* argument) {
    const std::unique_ptr<std::shared_ptr<Watch>> own(static_cast<std::shared_ptr<Watch>*>(argument));
    try {
        (*own)->Run();
    } catch (...) {  // the lock itself failed
    }
    return 0;
}

void InterruptListener_Win64::Stop() try {
    if (!thread) {
        return;
    }
    if (watch->IsOwnThread()) {
        watch->RequestStop();
        thread.Reset();
        return;
    }
    bool ended = false;
    for (int round = 0; round < StopRounds && !ended && watch->GetState() != Watch::State::Ended; ++round) {
        watch->RequestStop();
        Platform::SleepMilliseconds(0);
        ended = HasEnded(thread.Get(), StopRoundLimit);
    }
    if (!ended) {
        if (watch->GetState() != Watch::State::Ended) {
            pipe->Close();  // its read may hang in the driver, which the end of the pipe is the end of
        }
        if (!HasEnded(thread.Get(), StopRoundLimit) && !watch->EndByForce(thread.Get())) {
            KeepForever(pipe);
        }
    }
    thread.Reset();
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
