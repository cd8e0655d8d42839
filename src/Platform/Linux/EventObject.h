#pragma once

#include "Platform/Linux/WaitableObject.h"

namespace Varnholt::Platform::Linux {

/// An auto-reset event.
class EventObject final : public WaitableObject {
  public:
    Taken TryTake(ThreadRecord& taker) override;
    ErrorCode Signal(ThreadRecord& signaller) override;
    std::string Describe() const override { return "an event"; }

  private:
    bool signalled_ = false;
};

}  // namespace Varnholt::Platform::Linux
