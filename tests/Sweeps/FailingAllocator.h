#pragma once

/// For test programs that replace the allocation functions: one allocation of the process can be made to
/// fail.
namespace Varnholt::Tests {

/// While it lives, the allocations of this thread neither fail nor count. The simulated instrument, the bus
/// and a test itself are not what is tested.
class Exempt final {
  public:
    Exempt();
    ~Exempt();
    Exempt(const Exempt&) = delete;
    Exempt& operator=(const Exempt&) = delete;
};

/// Lets the allocation fail that is `number` from now, counted from 1, on whatever thread.
void FailAllocation(long number);
/// No allocation fails any more. Answers whether one has failed since `FailAllocation`.
bool StopFailing();

}  // namespace Varnholt::Tests
