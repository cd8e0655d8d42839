#pragma once

#include <utility>

#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// An auto-reset event.
class EventObject final : public WaitableObject {
  public:
    Taken TryTake(ThreadRecord& /*taker*/) override {
        return std::exchange(signalled_, false) ? Taken::Yes : Taken::No;
    }
    ErrorCode Signal(ThreadRecord& /*signaller*/) override {
        signalled_ = true;
        OfferToWaiters();
        return Errors::Success;
    }
    std::shared_ptr<CompletionSource> SignalledBy() const override { return source_.lock(); }
    std::string Describe() const override { return "an event"; }

    /// Not signalled; the next signal is an end that comes from `source`, which may be null.
    void Reset(const std::shared_ptr<CompletionSource>& source) {
        signalled_ = false;
        source_ = source;
    }

  private:
    bool signalled_ = false;
    std::weak_ptr<CompletionSource> source_;
};

}  // namespace Varnholt::Platform::Linux
