#include "DeviceDriver/Ostra/LowLevel/Win32/InterruptListener.h"

#include <atomic>
#include <thread>
#include <utility>
#include <vector>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/USBConnection.h"
#include "Platform/Threads.h"
#include "Platform/WaitableObjects.h"
#include "Utilities/Exceptions/Location.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Generic::EventListener;
using Generic::Utilities::IOException;
using Platform::WaitResult;
using Varnholt::Utilities::Exceptions::Here;
using Varnholt::Utilities::Multithreading::Mutex;
using Varnholt::Utilities::Multithreading::ScopedLock;

namespace {

constexpr std::size_t ReceiveBufferSize = 8;
constexpr std::uint32_t StartLimit = 2000;
constexpr int StopRounds = 10;
constexpr std::uint32_t StopRoundLimit = 1000;
constexpr std::uint32_t ForcedExitCode = 0xFFFFFFFF;

bool HasEnded(Platform::Handle thread, std::uint32_t limit) {
    const WaitResult waited = Platform::Wait(thread, limit);
    return waited == WaitResult::Signalled || waited == WaitResult::Abandoned;
}

}  // namespace

/// What the thread works on. The thread and the listener own it together, so that a thread that could not be
/// ended finds its things in place however late it comes back.
class InterruptListener::Watch final {
  public:
    explicit Watch(const std::string& path) : devicePath(path) {
        if (!started || !wake) {
            throw IOException("could not create interrupt listener events", Here());
        }
    }

    enum class State { Running, StopRequested, Ended };

    void SetReceiver(std::shared_ptr<EventListener> receiver) {
        const ScopedLock held(lock);
        listener.swap(receiver);
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

    Platform::OwnedHandle Launch(Platform::ThreadEntry entry, void* argument) {
        const ScopedLock held(lock);  // the thread finds its state set
        Platform::OwnedHandle thread(Platform::StartThread(entry, argument));
        if (thread) {
            state = State::Running;
        }
        return thread;
    }
    bool AwaitStart() { return Platform::Wait(started.Get(), StartLimit) == WaitResult::Signalled; }
    void RequestStop() {
        const ScopedLock held(lock);
        if (state == State::Running) {
            state = State::StopRequested;
        }
        endRequested = true;
        Platform::SignalEvent(wake.Get());
    }
    void ClosePipe() {
        if (const std::shared_ptr<USBConnection> closing = ExchangePipe(nullptr)) {
            closing->Close();
        }
    }

    void Run() {
        try {
            Listen();
        } catch (...) {  // whatever it was, it ends the thread
        }
        ClosePipe();
        const ScopedLock held(lock);
        state = State::Ended;
        threadId = {};
    }

  private:
    void Listen();
    void DispatchEvent(std::uint32_t count);

    std::shared_ptr<USBConnection> ExchangePipe(std::shared_ptr<USBConnection> connection) {
        const ScopedLock held(lock);
        return std::exchange(pipe, std::move(connection));
    }

    Mutex lock{""};
    const Platform::OwnedHandle started{Platform::MakeAutoResetEvent()};
    const Platform::OwnedHandle wake{Platform::MakeAutoResetEvent()};
    const std::string devicePath;
    std::atomic<bool> endRequested = false;
    // Guarded by `lock`:
    State state = State::Ended;
    bool touched = false;
    std::shared_ptr<EventListener> listener;
    std::shared_ptr<USBConnection> pipe;  ///< a `Stop` with no other means left closes it
    std::thread::id threadId;
};

void InterruptListener::Watch::Listen() {
    {
        const ScopedLock held(lock);
        threadId = std::this_thread::get_id();
    }
    std::vector<std::uint8_t> buffer(ReceiveBufferSize);
    const auto connection =
        std::make_shared<USBConnection>(devicePath, Protocol::NativeDriver::InterruptPipe, wake.Get());
    ExchangePipe(connection);
    Platform::SignalEvent(started.Get());
    Platform::SleepMilliseconds(0);
    for (std::uint32_t count = 1; count != 0 && !endRequested;) {
        count = connection->Read(buffer, endRequested);
        DispatchEvent(count);
    }
}

void InterruptListener::Watch::DispatchEvent(std::uint32_t count) {
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

InterruptListener::InterruptListener(const std::string& devicePath) try
    : watch(std::make_shared<Watch>(devicePath)) {}
TRACED

InterruptListener::~InterruptListener() {
    try {
        Stop();
        ClearListener();
    } catch (...) {  // nobody is left to tell
    }
}

void InterruptListener::SetListener(std::shared_ptr<EventListener> receiver) try {
    watch->SetReceiver(std::move(receiver));
}
TRACED

void InterruptListener::SetListener(EventListener* receiver) try {
    watch->SetReceiver(std::shared_ptr<EventListener>(std::shared_ptr<void>(), receiver));
}
TRACED

void InterruptListener::ClearListener() try { watch->SetReceiver(nullptr); }
TRACED

bool InterruptListener::IsTouched() const try { return watch->IsTouched(); }
TRACED

void InterruptListener::Start() try {
    auto argument = std::make_unique<std::shared_ptr<Watch>>(watch);
    thread = watch->Launch(ThreadEntry, argument.get());
    if (!thread) {
        throw IOException("could not create interrupt listener thread", Here());
    }
    argument.release();  // the thread's
    if (!watch->AwaitStart()) {
        throw IOException("interrupt listener thread had timeout", Here());
    }
}
TRACED

std::uint32_t InterruptListener::ThreadEntry(void* argument) {
    const std::unique_ptr<std::shared_ptr<Watch>> own(static_cast<std::shared_ptr<Watch>*>(argument));
    try {
        (*own)->Run();
    } catch (...) {  // the lock itself failed
    }
    return 0;
}

void InterruptListener::Stop() try {
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
        // Its read may hang in the driver, which the end of the pipe is the end of.
        watch->ClosePipe();
        if (!HasEnded(thread.Get(), StopRoundLimit)) {
            Platform::EndThreadByForce(thread.Get(), ForcedExitCode);
        }
    }
    thread.Reset();
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
