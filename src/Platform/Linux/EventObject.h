#pragma once

#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// An auto-reset event.
class EventObject final : public WaitableObject {
  public:
    Taken TryTake(ThreadRecord& taker) override;
    ErrorCode Signal(ThreadRecord& signaller) override;
    std::shared_ptr<CompletionSource> SignalledBy() const override { return source_.lock(); }
    std::string Describe() const override { return "an event"; }

    /// Not signalled; the next signal is an end that comes from `source`, which may be null.
    void Reset(const std::shared_ptr<CompletionSource>& source);

  private:
    bool signalled_ = false;
    std::weak_ptr<CompletionSource> source_;
};

}  // namespace Varnholt::Platform::Linux
