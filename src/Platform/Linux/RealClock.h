#pragma once

#include "Platform/Linux/Clock.h"

namespace Varnholt::Platform::Linux {

/// The system's time; threads run as the system schedules them.
class RealClock final : public Clock {
  public:
    static RealClock& Instance();

    bool IsCooperative() const override { return false; }
    Microseconds Now() override;
    WallTime Wall() override;
    EventScheduler& Scheduler() override;

    void Block(DispatcherLock& hold, BlockedCall& call, Microseconds deadline) override;
    void Wake(BlockedCall& call) override;
    void BlockOnOtherProcess(DispatcherLock& hold, BlockedCall& call, Microseconds deadline,
                             Microseconds period, WaitableObject* only, std::uint32_t seen) override;
    void Preempt(DispatcherLock& /*hold*/) override {}
    void GiveUpSlice(DispatcherLock& hold) override;
    void ThreadMade(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) override {}
    void ThreadBegins(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) override {}
    void ThreadEnds(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) override {}
    void ThreadNeverBegan(DispatcherLock& /*hold*/, ThreadRecord& /*thread*/) override {}

  private:
    static bool HandleEvents(DispatcherLock& hold, BlockedCall& call, Microseconds deadline);
};

}  // namespace Varnholt::Platform::Linux
