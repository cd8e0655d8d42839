#pragma once

#include <memory>
#include <string>

#include "Platform/Handle.h"
#include "Utilities/Multithreading/TryLockable.h"
#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::Utilities::Multithreading {

/// A lock whose behaviour is that of the implementation object it was built with. Copies share it. Locking
/// is safe on any thread; copying and destroying copies must stay on one thread at a time (see
/// `SmartPointer`).
///
/// The three operations only pass on, so that what an implementation throws arrives unchanged.
class SynchronizationObject : public TryLockable {
  public:
    struct Impl {
        Impl() = default;
        Impl(const Impl&) = delete;
        Impl& operator=(const Impl&) = delete;
        virtual ~Impl() = default;
        virtual void Lock() = 0;
        virtual bool TryLock(int timeout) = 0;
        virtual void Unlock() = 0;
        /// What a `Condition` waits with. Of an object that has no handle: a value that names no handle.
        virtual Platform::Handle GetHandle() = 0;
    };

    explicit SynchronizationObject(std::unique_ptr<Impl> owned) : impl_(owned.release()) {}

    void Lock() override { impl_->Lock(); }
    void Unlock() override { impl_->Unlock(); }
    bool TryLock(int timeout) override { return impl_->TryLock(timeout); }

  private:
    friend class ConditionImpl;

    Tools::SmartPointer<Impl> impl_;
};

/// A recursive lock. An empty name makes it local to the process and without time-outs: its `TryLock` always
/// throws `std::runtime_error`. A name makes it one lock for every holder of that name on the machine.
std::unique_ptr<SynchronizationObject::Impl> CreateMutexImpl(const std::string& name);

/// A semaphore with initial count 1, shared by name unless the name is empty. `Lock` takes one, from any
/// thread; `Unlock` gives one back and has no effect at the maximum.
std::unique_ptr<SynchronizationObject::Impl> CreateSemaphoreImpl(const std::string& name, int maximumCount);

}  // namespace Varnholt::Utilities::Multithreading
