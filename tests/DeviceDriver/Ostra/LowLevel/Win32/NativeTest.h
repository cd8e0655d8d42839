#pragma once

#include "Platform/ErrorCodes.h"
#include "Protocol/NativeDriver.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {

inline std::string ErrorSuffix(Platform::ErrorCode code) {
    return " (Win32 Error (" + std::to_string(code) + ") : " + Platform::ErrorText(code) + ")";
}

class NativeTest : public DriverTest {
  protected:
    explicit NativeTest(TestTime time = TestTime::Virtual) : DriverTest(time) {}

    /// The listener's thread waits for the instrument.
    bool IsListening() const { return driver_.Running(Protocol::NativeDriver::InterruptPipe) == 1; }
};

}  // namespace Varnholt::Tests
