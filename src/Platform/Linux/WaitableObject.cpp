#include "Platform/Linux/WaitableObject.h"

#include <algorithm>

#include "Platform/Linux/SharedContent.h"

namespace Varnholt::Platform::Linux {
namespace {

/// How often a thread that waits for several objects looks for what another process may have released.
constexpr Microseconds FirstLook = 500;
constexpr Microseconds LongestLook = 4000;

}  // namespace

/// One wait, entered with each of its objects.
class Waiter final : public BlockedCall {
  public:
    Waiter(ThreadRecord& caller, std::span<WaitEntry> waitedFor)
        : BlockedCall(caller, ""), entries_(waitedFor) {
        for (WaitEntry& entry : entries_) {
            entry.waiter = this;
            entry.object->Enqueue(entry);
        }
        if (entries_.size() == 1) {  // who listens to several things waits for long, and is not urgent
            source = entries_[0].object->SignalledBy();
        }
    }
    ~Waiter() override {
        for (WaitEntry& entry : entries_) {
            entry.object->Dequeue(entry);
        }
    }

    bool Take() {
        const auto untilTaken = [this](const WaitEntry& entry) { return Offer(*entry.object); };
        return std::ranges::any_of(entries_, untilTaken);
    }

    /// True when the object was taken.
    bool Offer(WaitableObject& object) {
        const WaitableObject::Taken taken = object.TryTake(thread);
        if (taken == WaitableObject::Taken::No) {
            return false;
        }
        const auto found = std::ranges::find_if(
            entries_, [&](const WaitEntry& entry) { return entry.object.get() == &object; });
        outcome_.index = static_cast<std::size_t>(found - entries_.begin());
        outcome_.result =
            taken == WaitableObject::Taken::Abandoned ? WaitResult::Abandoned : WaitResult::Signalled;
        return true;
    }

    bool IsSatisfied() const { return outcome_.result != WaitResult::TimedOut; }
    const WaitAnyResult& Outcome() const { return outcome_; }

    bool NeedsOtherProcess() const {
        return std::ranges::any_of(entries_,
                                   [](const WaitEntry& entry) { return entry.object->IsHeldElsewhere(); });
    }

    std::string Describe() const override {
        std::string text;
        for (const WaitEntry& entry : entries_) {
            text += (text.empty() ? "" : " or ") + entry.object->Describe();
        }
        return text;
    }

  private:
    const std::span<WaitEntry> entries_;
    WaitAnyResult outcome_{WaitResult::TimedOut, 0};
};

void WaitableObject::Enqueue(WaitEntry& entry) {
    entry.previous = last_;
    (last_ ? last_->next : first_) = &entry;
    last_ = &entry;
}

void WaitableObject::Dequeue(WaitEntry& entry) {
    (entry.previous ? entry.previous->next : first_) = entry.next;
    (entry.next ? entry.next->previous : last_) = entry.previous;
}

void WaitableObject::OfferToWaiters() {
    for (const WaitEntry* entry = first_; entry; entry = entry->next) {
        Waiter& waiter = *entry->waiter;
        if (waiter.IsSatisfied()) {
            continue;
        }
        if (CanBeTakenForOthers() && !waiter.Offer(*this)) {
            return;
        }
        CurrentClock().Wake(waiter);
    }
}

WaitAnyResult WaitForAny(DispatcherLock& hold, std::span<WaitEntry> entries, Microseconds deadline) {
    Waiter waiter(CurrentThread(), entries);
    Clock& clock = CurrentClock();
    ChangeCount* const changes = entries.size() == 1 ? entries[0].object->SharedChanges() : nullptr;
    Microseconds period = FirstLook;
    while (true) {
        // Before the look at the object, so that no change comes between the two.
        const std::uint32_t seen = changes ? changes->Get() : 0;
        waiter.woken = false;
        if (waiter.IsSatisfied() || waiter.Take() || clock.Now() >= deadline) {
            return waiter.Outcome();
        }
        if (waiter.NeedsOtherProcess()) {
            clock.BlockOnOtherProcess(hold, waiter, deadline, period, changes, seen);
            period = std::min(2 * period, LongestLook);
        } else {
            clock.Block(hold, waiter, deadline);
        }
        if (waiter.hopeless) {
            SetLastError(Errors::OperationAborted);
            return {WaitResult::Failed, 0};
        }
    }
}

}  // namespace Varnholt::Platform::Linux
