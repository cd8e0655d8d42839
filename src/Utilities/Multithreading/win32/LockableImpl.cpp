#include "Utilities/Multithreading/win32/LockableImpl.h"

#include <stdexcept>

#include "Utilities/Multithreading/SynchronizationObject.h"

namespace Varnholt::Utilities::Multithreading {
namespace {

class CriticalSection final : public SynchronizationObject::Impl {
  public:
    void Lock() override { section_.lock(); }
    /// Untraced, so that the standard exception stays one.
    bool TryLock(int) override {
        throw std::runtime_error(
            "CriticalSection::TryLock: not yet implemented (TryEnterCriitcalSection not exists on  Win9X)");
    }
    void Unlock() override { section_.unlock(); }
    Platform::Handle GetHandle() override { return &section_; }

  private:
    Platform::RecursiveMutex section_;
};

class MutexImpl final : public Win32Lockable<SynchronizationObject::Impl> {
  public:
    explicit MutexImpl(const std::string& objectName)
        : Win32Lockable(Platform::MakeMutex(objectName), objectName) {}
    void Unlock() override { Platform::ReleaseMutex(GetHandle()); }
};

class SemaphoreImpl final : public Win32Lockable<SynchronizationObject::Impl> {
  public:
    SemaphoreImpl(int maximumCount, const std::string& objectName)
        : Win32Lockable(Platform::MakeSemaphore(1, maximumCount, objectName), objectName) {}
    void Unlock() override { Platform::ReleaseSemaphore(GetHandle(), 1); }
};

}  // namespace

std::unique_ptr<SynchronizationObject::Impl> CreateMutexImpl(const std::string& name) {
    if (name.empty()) {
        return std::make_unique<CriticalSection>();
    }
    return std::make_unique<MutexImpl>(name);
}

std::unique_ptr<SynchronizationObject::Impl> CreateSemaphoreImpl(const std::string& name, int maximumCount) {
    return std::make_unique<SemaphoreImpl>(maximumCount, name);
}

}  // namespace Varnholt::Utilities::Multithreading
