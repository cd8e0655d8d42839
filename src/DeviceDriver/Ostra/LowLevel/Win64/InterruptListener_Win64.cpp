#include "DeviceDriver/Ostra/LowLevel/Win64/InterruptListener_Win64.h"

#include <list>

#include "DeviceDriver/Ostra/LowLevel/InterruptWatch.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using namespace Protocol::UsbIoDriver;
using Generic::EventListener;
using UsbIo::CUsbIoPipe;
using Varnholt::Utilities::Multithreading::Mutex;
using Varnholt::Utilities::Multithreading::ScopedLock;
using Varnholt::Utilities::Tools::SmartPointer;

namespace {

constexpr std::uint32_t StaleReadLimit = 10;
constexpr std::uint32_t ReadLimit = 1000;

/// For a thread that could not be ended: whenever it comes back, it must find its (closed) pipe. It cannot
/// own it, because the pointer's count is not for two threads.
void KeepForever(const SmartPointer<CUsbIoPipe>& pipe) {
    static auto* const kept = new std::list<SmartPointer<CUsbIoPipe>>;
    kept->push_back(pipe);
}

}  // namespace

/// Lock order: `deliveryLock`, then `lock`. A message is delivered under `deliveryLock` alone, so that a
/// receiver that does not return holds up whoever takes it away, but not `Stop`.
class InterruptListener_Win64::Watch final : public InterruptWatch {
  public:
    /// Before the thread starts.
    void SetPipe(CUsbIoPipe* boundPipe) { pipe_ = boundPipe; }

    /// Not owned.
    void SetReceiver(EventListener* receiver) {
        if (WasEndedByForce()) {
            return;  // no message can be under way, and nobody may be left to free the lock
        }
        const ScopedLock delivering(deliveryLock_);
        InterruptWatch::SetReceiver(std::shared_ptr<EventListener>(std::shared_ptr<void>(), receiver));
    }

    void Listen() override;
    void Deliver(std::uint32_t count) {
        const ScopedLock delivering(deliveryLock_);
        DispatchEvent(count);
    }

  private:
    enum class Outcome { Nothing, Data, Failed };

    void ClosePipe() override { pipe_->Close(); }
    Outcome Read(std::uint32_t limit);

    Mutex deliveryLock_{""};
    CUsbIoPipe* pipe_ = nullptr;
};

void InterruptListener_Win64::Watch::Listen() {
    ReportStart();
    Read(StaleReadLimit);  // an interrupt left from before is thrown away
    while (!EndRequested()) {
        const Outcome outcome = Read(ReadLimit);
        if (outcome != Outcome::Nothing) {
            Deliver(outcome == Outcome::Data ? 1 : 0);
        }
        if (outcome == Outcome::Failed) {
            break;
        }
    }
}

InterruptListener_Win64::Watch::Outcome InterruptListener_Win64::Watch::Read(std::uint32_t limit) {
    std::uint8_t data = 0;
    std::uint32_t size = sizeof(data);
    const std::uint32_t status = pipe_->ReadSyncUntil(&data, size, limit, Wake());
    // A read that was given up can have moved its byte all the same, and the button is not pressed twice.
    if (status == Status::Success || size > 0) {
        return Outcome::Data;
    }
    return status == Status::TimedOut || status == Status::UserEvent ? Outcome::Nothing : Outcome::Failed;
}

InterruptListener_Win64::InterruptListener_Win64(const std::string&) try
    : watch_(std::make_shared<Watch>()) {}
TRACED

InterruptListener_Win64::~InterruptListener_Win64() {
    try {
        Stop();
    } catch (...) {  // nobody is left to tell
    }
}

void InterruptListener_Win64::SetListener(EventListener* receiver) try { watch_->SetReceiver(receiver); }
TRACED

void InterruptListener_Win64::ClearListener() try { watch_->SetReceiver(nullptr); }
TRACED

void InterruptListener_Win64::SetPipe(const SmartPointer<CUsbIoPipe>& boundPipe) try { pipe_ = boundPipe; }
TRACED

bool InterruptListener_Win64::IsTouched() const try { return watch_->IsTouched(); }
TRACED

void InterruptListener_Win64::Start() try {
    if (!thread_) {
        watch_->SetPipe(&*pipe_);
    }
    watch_->Start(thread_);
}
TRACED

void InterruptListener_Win64::Stop() try {
    if (thread_ && !watch_->End(thread_)) {
        KeepForever(pipe_);
    }
}
TRACED

void InterruptListener_Win64::Listen() try {
    watch_->SetPipe(&*pipe_);
    watch_->Listen();
}
TRACED

void InterruptListener_Win64::DispatchEvent(std::uint32_t count) try { watch_->Deliver(count); }
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
