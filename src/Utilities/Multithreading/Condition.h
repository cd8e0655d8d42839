#pragma once

#include <cstdint>

#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::Utilities::Multithreading {

/// A condition variable over a `Mutex` that has a name (a nameless one has no handle to wait with: `Wait`
/// refuses it). The mutex must outlive the condition.
///
/// Failures are `ResourceException`; before `signal` and `broadcast` throw they unlock the mutex, and after a
/// failed `Wait` the caller does not hold it. `Wait` may return without a signal: look at what was waited
/// for again.
class Condition final {
  public:
    struct Impl {
        Impl() = default;
        Impl(const Impl&) = delete;
        Impl& operator=(const Impl&) = delete;
        virtual ~Impl() = default;
        virtual void signal() = 0;
        virtual void broadcast() = 0;
        virtual bool Wait(std::int32_t argument) = 0;
    };

    explicit Condition(Mutex& mutex);

    /// Wakes one waiter, if there is one.
    void signal() { impl_->signal(); }
    /// Wakes all present waiters and returns when each has left its wait for the condition. They then wait
    /// for the mutex, which the caller may hold.
    void broadcast() { impl_->broadcast(); }
    /// The caller holds the mutex, once. Gives it up, waits without limit, takes it again, answers true. The
    /// argument has no meaning.
    bool Wait(std::int32_t argument) { return impl_->Wait(argument); }

  private:
    Tools::SmartPointer<Impl> impl_;
};

Tools::SmartPointer<Condition::Impl> CreateConditionImpl(Mutex& mutex);

}  // namespace Varnholt::Utilities::Multithreading
