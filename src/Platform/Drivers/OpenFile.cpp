#include "Platform/Drivers/OpenFile.h"

#include <array>
#include <new>
#include <utility>

#include "Platform/Drivers/RecordState.h"

namespace Varnholt::Platform::Drivers {
namespace {

Decision Decide(DriverFile& driver, const Operation& operation, Usb::Transfer& transfer) {
    transfer.data = operation.data;
    transfer.length = operation.length;
    switch (operation.kind) {
        case Operation::Kind::Read:
            return driver.Read(transfer);
        case Operation::Kind::Write:
            return driver.Write(transfer);
        case Operation::Kind::Control:
            break;
    }
    try {
        return driver.Control(operation.code, operation.input, {operation.data, operation.length}, transfer);
    } catch (const std::bad_alloc&) {
        return Decision::Refuse(driver.RefusalOf(Errors::NotEnoughMemory));
    } catch (...) {
        return Decision::Refuse(driver.RefusalOf(Errors::GeneralFailure));
    }
}

bool NotStarted(Overlapped& record, ErrorCode code) {
    MarkNotStarted(record, code);
    SetLastError(code);
    return false;
}

}  // namespace

void RunningRequest::TransferCompleted(Usb::Transfer&) noexcept {
    if ((state.fetch_or(Completed, std::memory_order_acq_rel) & Submitted) != 0) {
        file.Ended(*this);
    }
}

OpenFile::~OpenFile() {
    while (spare_ != nullptr) {
        delete std::exchange(spare_, spare_->next);
    }
}

std::uint32_t OpenFile::Open(std::unique_ptr<DriverFile> opened) {
    const std::lock_guard guard(lock_);
    driver_ = std::move(opened);
    use_ = Use::Open;
    generation_ = (generation_ + 1) & ((1U << GenerationBits) - 1);
    return generation_;
}

std::uint32_t OpenFile::Generation() const {
    const std::lock_guard guard(lock_);
    return generation_;
}

bool OpenFile::IsFree() const {
    const std::lock_guard guard(lock_);
    return use_ == Use::Free;
}

void OpenFile::Free() {
    const std::lock_guard guard(lock_);
    use_ = Use::Free;
}

std::unique_ptr<DriverFile> OpenFile::Close(std::uint32_t openedAs) {
    {
        const std::lock_guard guard(lock_);
        if (use_ != Use::Open || generation_ != openedAs) {
            return nullptr;
        }
        use_ = Use::Closing;  // nothing starts from here on
    }
    Cancel([](const RunningRequest&) { return true; });
    AwaitIdle();

    RunningRequest* unused = nullptr;
    OwnedHandle event;
    std::unique_ptr<DriverFile> closed;
    {
        const std::lock_guard guard(lock_);
        use_ = Use::Closed;
        closed = std::move(driver_);
        std::swap(unused, spare_);
        event = std::move(spareEvent_);
    }
    while (unused != nullptr) {
        delete std::exchange(unused, unused->next);
    }
    return closed;
}

bool OpenFile::Start(std::uint32_t openedAs, const Operation& operation, Overlapped& record) {
    if (IsRunning(record)) {
        SetLastError(Errors::InvalidParameter);
        return false;
    }
    ErrorCode error = Errors::InvalidHandle;
    RunningRequest* const request = Begin(openedAs, record, error);
    if (request == nullptr) {
        return NotStarted(record, error);
    }
    const Decision decision = Decide(*driver_, operation, request->transfer);
    if (decision.kind == Decision::Kind::Refused) {
        Retire(*request);
        return NotStarted(record, decision.code);
    }
    request->endpoint.store(request->transfer.endpoint, std::memory_order_relaxed);
    MarkRunning(record);
    if (decision.kind == Decision::Kind::Done) {
        MarkEnded(record, Errors::Success, decision.bytes);
        Retire(*request);
        return true;
    }
    LimitTime(*request);
    const ErrorCode refused = driver_->Device().Submit(request->transfer);
    if (refused != Errors::Success) {
        const ErrorCode code = driver_->RefusalOf(refused);
        Retire(*request);
        return NotStarted(record, code);
    }
    // Once `Submitted` is set, the request can end at any moment and is not touched any more.
    std::uint32_t before = 0;
    if (request->state.compare_exchange_strong(before, RunningRequest::Submitted,
                                               std::memory_order_acq_rel)) {
        SetLastError(Errors::IoPending);
        return false;
    }
    if ((before & RunningRequest::Completed) == 0) {
        CancelAfterSubmit(*request);
        SetLastError(Errors::IoPending);
        return false;
    }
    if (Finish(*request) == Errors::Success) {
        return true;
    }
    // A transfer that fails at once was started all the same: its failure is the request's result.
    SetLastError(Errors::IoPending);
    return false;
}

RunningRequest* OpenFile::Begin(std::uint32_t openedAs, Overlapped& record, ErrorCode& error) {
    const std::lock_guard guard(lock_);
    if (use_ != Use::Open || generation_ != openedAs) {
        error = Errors::InvalidHandle;
        return nullptr;
    }
    RunningRequest* request = spare_;
    if (request != nullptr) {
        spare_ = request->next;
    } else {
        request = new (std::nothrow) RunningRequest(*this);
        if (request == nullptr) {
            error = Errors::NotEnoughMemory;
            return nullptr;
        }
    }
    request->record = &record;
    request->starter = std::this_thread::get_id();
    request->state.store(0, std::memory_order_relaxed);
    request->endpoint.store(RunningRequest::Undecided, std::memory_order_relaxed);
    request->waitLimit.store(0, std::memory_order_relaxed);
    request->number = ++lastNumber_;
    request->ended = false;
    request->previous = nullptr;
    request->next = running_;
    if (running_ != nullptr) {
        running_->previous = request;
    }
    running_ = request;
    return request;
}

/// Before the transfer is submitted. A control is waited for here, anything else wherever its starter likes.
void OpenFile::LimitTime(RunningRequest& request) {
    const std::uint32_t limit = driver_->TimeLimitOf(request.transfer);
    if (limit == 0) {
        return;
    }
    if (request.transfer.endpoint == 0) {
        request.waitLimit.store(limit, std::memory_order_relaxed);
        return;
    }
    EventScheduler& scheduler = ClockScheduler();
    try {
        request.alarm = scheduler.CallAt(scheduler.Now() + std::uint64_t{limit} * 1000,
                                         [this, number = request.number] { GiveUp(number); });
    } catch (...) {
        // No memory for the alarm: the transfer goes on without one.
    }
}

void OpenFile::GiveUp(std::uint64_t number) {
    Cancel([number](const RunningRequest& request) { return request.number == number; },
           RunningRequest::CancelWanted | RunningRequest::TimedOut);
}

/// The starter's part of a cancellation that came before the device had the transfer.
void OpenFile::CancelAfterSubmit(RunningRequest& request) {
    {
        const std::lock_guard guard(lock_);
        Pin(request);
    }
    const std::uint32_t before = request.state.fetch_or(RunningRequest::Submitted, std::memory_order_acq_rel);
    if ((before & RunningRequest::Completed) != 0) {
        Finish(request);
    } else {
        driver_->Device().Cancel(request.transfer);
    }
    Unpin(request);
}

void OpenFile::Ended(RunningRequest& request) {
    Finish(request);
}

ErrorCode OpenFile::Finish(RunningRequest& request) {
    const Usb::Transfer& transfer = request.transfer;
    driver_->Device().Learn(transfer);
    const bool timedOut = transfer.status == Usb::TransferStatus::Cancelled &&
                          (request.state.load(std::memory_order_relaxed) & RunningRequest::TimedOut) != 0;
    const ErrorCode code = timedOut ? driver_->TimedOutCode() : driver_->OutcomeOf(transfer.status);
    const std::uint32_t moved =
        transfer.actualLength < transfer.length ? transfer.actualLength : transfer.length;
    // The record first: `Close` lets go of the caller's memory as soon as the request is off the list.
    MarkEnded(*request.record, code, moved);
    Retire(request);
    return code;
}

void OpenFile::Retire(RunningRequest& request) {
    if (request.alarm != 0) {
        ClockScheduler().Forget(std::exchange(request.alarm, 0));
    }
    Waiter* released = nullptr;
    {
        const std::lock_guard guard(lock_);
        (request.previous != nullptr ? request.previous->next : running_) = request.next;
        if (request.next != nullptr) {
            request.next->previous = request.previous;
        }
        request.ended = true;
        if (request.pins == 0) {
            Recycle(request);
        }
        released = waiters_ != nullptr ? TakeReleased() : nullptr;
    }
    Waiter::Release(released);
}

void OpenFile::Recycle(RunningRequest& request) {
    request.record = nullptr;
    request.next = spare_;
    spare_ = &request;
}

void OpenFile::Pin(RunningRequest& request) {
    if (request.pins++ == 0) {
        ++pinned_;
    }
}

void OpenFile::Unpin(RunningRequest& request) {
    Waiter* released = nullptr;
    {
        const std::lock_guard guard(lock_);
        if (--request.pins == 0) {
            --pinned_;
            if (request.ended) {
                Recycle(request);
            }
        }
        released = waiters_ != nullptr ? TakeReleased() : nullptr;
    }
    Waiter::Release(released);
}

template <class Matches>
void OpenFile::Cancel(Matches matches, std::uint32_t reason) {
    struct Chosen {
        RunningRequest* request;
        bool submitted;
    };
    std::array<Chosen, 8> chosen{};
    std::uint64_t newest = 0;  // what starts meanwhile is not meant
    for (bool isFirst = true;; isFirst = false) {
        std::size_t count = 0;
        {
            const std::lock_guard guard(lock_);
            newest = isFirst ? lastNumber_ : newest;
            for (auto* request = running_; request != nullptr && count < chosen.size();
                 request = request->next) {
                if (request->number > newest || !matches(*request)) {
                    continue;
                }
                const std::uint32_t before = request->state.fetch_or(reason, std::memory_order_acq_rel);
                if ((before & RunningRequest::CancelWanted) == 0) {
                    Pin(*request);
                    chosen[count++] = {request, (before & RunningRequest::Submitted) != 0};
                }
            }
        }
        if (count == 0) {
            return;
        }
        for (std::size_t i = 0; i < count; ++i) {
            if (chosen[i].submitted) {
                driver_->Device().Cancel(chosen[i].request->transfer);
            }
            Unpin(*chosen[i].request);
        }
    }
}

bool OpenFile::CancelOwn(std::uint32_t openedAs) {
    {
        const std::lock_guard guard(lock_);
        if (use_ != Use::Open || generation_ != openedAs) {
            return false;
        }
    }
    const auto self = std::this_thread::get_id();
    Cancel([self](const RunningRequest& request) { return request.starter == self; });
    return true;
}

void OpenFile::CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint) {
    // The file may be another's by now, hence the question at each request; where one runs there is a driver.
    Cancel([&device, endpoint, this](const RunningRequest& request) {
        return request.endpoint.load(std::memory_order_relaxed) == endpoint && &driver_->Device() == &device;
    });
}

bool OpenFile::WaitFor(std::uint32_t openedAs, const Overlapped& record) {
    while (IsRunning(record)) {
        Waiter waiter;
        Equip(waiter);
        bool enlisted = false;
        {
            const std::lock_guard guard(lock_);
            const RunningRequest* request = generation_ == openedAs ? running_ : nullptr;
            while (request != nullptr && request->record != &record) {
                request = request->next;
            }
            if (request != nullptr) {
                waiter.request = request;
                waiter.number = request->number;
                if (const std::uint32_t limit = request->waitLimit.load(std::memory_order_relaxed)) {
                    waiter.limit = limit;
                }
                Enlist(waiter);
                enlisted = true;
            }
        }
        if (!enlisted) {
            // Either it has just ended, or it never ran here.
            return !IsRunning(record);
        }
        Await(waiter);
    }
    return true;
}

void OpenFile::AwaitIdle() {
    {
        const std::lock_guard guard(lock_);
        if (IsIdle()) {
            return;
        }
    }
    Waiter waiter;
    Equip(waiter);
    {
        const std::lock_guard guard(lock_);
        if (IsIdle()) {
            return;
        }
        Enlist(waiter);
    }
    Await(waiter);
}

void OpenFile::Equip(Waiter& waiter) {
    OwnedHandle event;
    {
        const std::lock_guard guard(lock_);
        std::swap(event, spareEvent_);
    }
    waiter.Equip(std::move(event));
}

void OpenFile::Enlist(Waiter& waiter) {
    waiter.next = waiters_;
    waiters_ = &waiter;
}

void OpenFile::Await(Waiter& waiter) {
    if (!waiter.AwaitFor(waiter.limit)) {
        GiveUp(waiter.number);
    }
    OwnedHandle event = waiter.Await();
    const std::lock_guard guard(lock_);
    std::swap(spareEvent_, event);
}

Waiter* OpenFile::TakeReleased() {
    Waiter* released = nullptr;
    for (Waiter** link = &waiters_; *link != nullptr;) {
        Waiter* const waiter = *link;
        if (waiter->request != nullptr ? waiter->request->ended : IsIdle()) {
            *link = waiter->next;
            waiter->next = released;
            released = waiter;
        } else {
            link = &waiter->next;
        }
    }
    return released;
}

}  // namespace Varnholt::Platform::Drivers
