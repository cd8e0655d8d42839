#pragma once

#include "Platform/Linux/Clock.h"

namespace Varnholt::Platform::Linux {

/// The system's time; threads run as the system schedules them.
class RealClock final : public Clock {
  public:
    static RealClock& Instance();

    bool TakesTurns() const override { return false; }
    Microseconds Now() override;
    WallTime Wall() override;
    EventScheduler& Scheduler() override;

    void Block(KernelHold& hold, BlockedCall& call, Microseconds deadline) override;
    void Wake(BlockedCall& call) override;
    void BlockOnOtherProcess(KernelHold& hold, BlockedCall& call, Microseconds deadline, Microseconds period,
                             WaitableObject* only, std::uint32_t seen) override;
    void Preempt(KernelHold& /*hold*/) override {}
    void GiveUpSlice(KernelHold& hold) override;
    void ThreadMade(KernelHold& /*hold*/, ThreadRecord& /*thread*/) override {}
    void ThreadBegins(KernelHold& /*hold*/, ThreadRecord& /*thread*/) override {}
    void ThreadEnds(KernelHold& /*hold*/, ThreadRecord& /*thread*/) override {}
    void ThreadNeverBegan(KernelHold& /*hold*/, ThreadRecord& /*thread*/) override {}

  private:
    static bool WorkOff(KernelHold& hold, BlockedCall& call, Microseconds deadline);
};

}  // namespace Varnholt::Platform::Linux
