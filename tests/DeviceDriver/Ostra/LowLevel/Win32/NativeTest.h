#pragma once

#include <memory>

#include "Platform/ErrorCodes.h"
#include "Protocol/NativeDriver.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {

inline std::string ErrorSuffix(Platform::ErrorCode code) {
    return " (Win32 Error (" + std::to_string(code) + ") : " + Platform::ErrorText(code) + ")";
}

/// A mutex whose owner has ended without releasing it; a wait on it reports that once.
class AbandonedMutex final {
  public:
    AbandonedMutex() {
        BackgroundThread([this] { Platform::Wait(mutex_.Get(), Platform::Infinite); }).Join();
    }
    Platform::Handle Get() const { return mutex_.Get(); }

  private:
    const Platform::OwnedHandle mutex_{Platform::MakeMutex("")};
};

/// A handle that names nothing. (That of an object which is no more could come to name another.)
inline Platform::Handle NamesNothing() {
    static int object;
    return &object;
}

class NativeTest : public DriverTest {
  protected:
    explicit NativeTest(TestTime time = TestTime::Virtual) : DriverTest(time) {}

    /// The listener's thread waits for the instrument.
    bool IsListening() const { return driver_.Running(Protocol::NativeDriver::InterruptPipe) == 1; }
};

}  // namespace Varnholt::Tests
