#include "Platform/Drivers/OpenFile.h"

#include <algorithm>
#include <new>
#include <utility>

#include "Platform/Drivers/RecordState.h"
#include "Platform/EventScheduler.h"

namespace Varnholt::Platform::Drivers {

void RunningRequest::TransferCompleted(Usb::Transfer&) noexcept {
    if ((state.fetch_or(Completed, std::memory_order_acq_rel) & Submitted) != 0) {
        const std::shared_ptr<OpenFile> opened = file;  // outlives the request's end
        opened->Finish(*this);
    }
}

std::unique_ptr<DriverFile> OpenFile::Close() {
    {
        const std::lock_guard guard(lock_);
        if (std::exchange(closing_, true)) {
            return nullptr;
        }
    }
    Cancel([](const RunningRequest&) { return true; });
    for (;;) {
        {
            const std::lock_guard guard(lock_);
            if (IsIdle()) {
                return std::move(driver_);
            }
        }
        idle_.Wait(Infinite);
    }
}

bool OpenFile::Start(const Operation& operation, Overlapped& record) {
    if (IsRunning(record)) {
        SetLastError(Errors::InvalidParameter);
        return false;
    }
    ErrorCode error = Errors::Success;
    const std::shared_ptr<RunningRequest> request = Begin(record, error);
    if (!request) {
        return RefuseStart(record, error);
    }
    const Decision decision = driver_->Decide(operation, request->transfer);
    if (decision.kind == Decision::Kind::Refused) {
        Retire(*request);
        return RefuseStart(record, decision.code);
    }
    request->endpoint.store(request->transfer.endpoint, std::memory_order_relaxed);
    if (decision.kind == Decision::Kind::Done) {
        MarkEnded(record, Errors::Success, decision.bytes);
        Retire(*request);
        return true;
    }
    const auto completions = driver_->Device().CompletionsOf(request->transfer.endpoint);
    request->ended.Reset(completions);
    MarkRunning(record, completions);
    LimitTime(*request);
    const ErrorCode refused = driver_->Device().Submit(request->transfer);
    if (refused != Errors::Success) {
        const ErrorCode code = driver_->RefusalOf(refused);
        Retire(*request);
        return RefuseStart(record, code);
    }
    // Once `Submitted` is set, the request can end at any moment.
    std::uint32_t before = 0;
    if (request->state.compare_exchange_strong(before, RunningRequest::Submitted,
                                               std::memory_order_acq_rel)) {
        SetLastError(Errors::IoPending);
        return false;
    }
    if ((before & RunningRequest::Completed) == 0) {
        CancelAfterSubmit(*request);
    } else if (Finish(*request) == Errors::Success) {
        return true;
    }
    // A transfer that fails at once was started all the same: its failure is the request's result.
    SetLastError(Errors::IoPending);
    return false;
}

std::shared_ptr<RunningRequest> OpenFile::Begin(Overlapped& record, ErrorCode& error) try {
    auto request = std::make_shared<RunningRequest>(shared_from_this(), record);
    const std::lock_guard guard(lock_);
    if (closing_) {
        error = Errors::InvalidHandle;
        return nullptr;
    }
    request->number = ++lastNumber_;
    running_.push_back(request);
    return request;
} catch (const std::bad_alloc&) {
    error = Errors::NotEnoughMemory;
    return nullptr;
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
    // The request is there when this is called: its end forgets the alarm before anything else.
    const auto giveUp = [&request] {
        const std::shared_ptr<RunningRequest> late = request.shared_from_this();
        late->file->GiveUp(*late);
    };
    try {
        scheduler.CallAt(scheduler.Now() + std::uint64_t{limit} * 1000, giveUp, &request);
        request.hasAlarm = true;
    } catch (...) {
        // No memory for the alarm: the transfer goes on without one.
    }
}

void OpenFile::GiveUp(const RunningRequest& request) {
    Cancel([&request](const RunningRequest& running) { return &running == &request; },
           RunningRequest::CancelWanted | RunningRequest::TimedOut);
}

/// The starter's part of a cancellation that came before the device had the transfer.
void OpenFile::CancelAfterSubmit(RunningRequest& request) {
    {
        const std::lock_guard guard(lock_);
        ++cancelling_;
    }
    const std::uint32_t before = request.state.fetch_or(RunningRequest::Submitted, std::memory_order_acq_rel);
    if ((before & RunningRequest::Completed) != 0) {
        Finish(request);
    } else {
        driver_->Device().Cancel(request.transfer);
    }
    Leave([this] { --cancelling_; });
}

ErrorCode OpenFile::Finish(RunningRequest& request) {
    const Usb::Transfer& transfer = request.transfer;
    driver_->Device().Learn(transfer);
    const bool timedOut = transfer.status == Usb::TransferStatus::Cancelled &&
                          (request.state.load(std::memory_order_relaxed) & RunningRequest::TimedOut) != 0;
    const ErrorCode code = timedOut ? driver_->TimedOutCode() : driver_->OutcomeOf(transfer.status);
    // The record first: `Close` lets go of the caller's memory as soon as the request is off the list.
    MarkEnded(request.record, code, std::min(transfer.actualLength, transfer.length));
    Retire(request);
    return code;
}

void OpenFile::Retire(RunningRequest& request) {
    if (request.hasAlarm) {
        ClockScheduler().Forget(&request);
    }
    std::shared_ptr<RunningRequest> retired;
    Leave([&] {
        const auto place = std::ranges::find(running_, &request, &std::shared_ptr<RunningRequest>::get);
        retired = std::move(*place);
        running_.erase(place);
    });
    if (retired->isAwaited) {
        retired->ended.Signal();
    }
}

/// Takes something off what keeps the file busy; `Close` goes on when that was the last of it.
template <class Change>
void OpenFile::Leave(Change change) {
    bool isIdle = false;
    {
        const std::lock_guard guard(lock_);
        change();
        isIdle = closing_ && IsIdle();
    }
    if (isIdle) {
        idle_.Signal();
    }
}

template <class Matches>
void OpenFile::Cancel(Matches matches, std::uint32_t reason) {
    std::uint64_t newest = 0;  // what starts meanwhile is not meant
    {
        const std::lock_guard guard(lock_);
        newest = lastNumber_;
    }
    for (;;) {
        std::shared_ptr<RunningRequest> chosen;
        bool isSubmitted = false;
        const auto isToBeCancelled = [&](const std::shared_ptr<RunningRequest>& request) {
            if (request->number > newest || !matches(*request)) {
                return false;
            }
            const std::uint32_t before = request->state.fetch_or(reason, std::memory_order_acq_rel);
            isSubmitted = (before & RunningRequest::Submitted) != 0;
            return (before & RunningRequest::CancelWanted) == 0;
        };
        {
            const std::lock_guard guard(lock_);
            const auto found = std::ranges::find_if(running_, isToBeCancelled);
            if (found == running_.end()) {
                return;
            }
            chosen = *found;
            ++cancelling_;
        }
        if (isSubmitted) {
            driver_->Device().Cancel(chosen->transfer);
        }
        Leave([this] { --cancelling_; });
    }
}

void OpenFile::CancelOwn() {
    const auto self = std::this_thread::get_id();
    Cancel([self](const RunningRequest& request) { return request.starter == self; });
}

void OpenFile::CancelEndpoint(const SharedDevice& device, std::uint8_t endpoint) {
    Cancel([&device, endpoint, this](const RunningRequest& request) {
        return request.endpoint.load(std::memory_order_relaxed) == endpoint && &driver_->Device() == &device;
    });
}

bool OpenFile::WaitFor(const Overlapped& record) {
    while (IsRunning(record)) {
        const std::shared_ptr<RunningRequest> request = FindAwaited(record);
        if (!request) {
            // Either it has just ended, or it never ran here.
            return !IsRunning(record);
        }
        const std::uint32_t limit = request->waitLimit.load(std::memory_order_relaxed);
        if (request->ended.Wait(limit != 0 ? limit : Infinite)) {
            request->ended.Signal();  // for whoever else waits
        } else {
            GiveUp(*request);
        }
    }
    return true;
}

/// The request that runs on a record; its end will be signalled.
std::shared_ptr<RunningRequest> OpenFile::FindAwaited(const Overlapped& record) {
    const std::lock_guard guard(lock_);
    const auto found = std::ranges::find_if(running_, [&](const std::shared_ptr<RunningRequest>& request) {
        return &request->record == &record;
    });
    if (found == running_.end()) {
        return nullptr;
    }
    (*found)->isAwaited = true;
    return *found;
}

}  // namespace Varnholt::Platform::Drivers
