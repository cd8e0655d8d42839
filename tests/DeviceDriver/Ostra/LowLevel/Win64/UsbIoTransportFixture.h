#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"
#include "Platform/HostQueries.h"
#include "Support/ScriptedUsbIo.h"
#include "Support/TestClock.h"

namespace Varnholt::Tests {

/// A host on which USBIO is the transport, with a scripted driver in the place of the real one.
class UsbIoTransportFixture : public testing::Test {
  protected:
    UsbIoTransportFixture();
    ~UsbIoTransportFixture() override;

    /// Opens the first instrument and forgets what that took.
    std::unique_ptr<DeviceDriver::Ostra::LowLevel::PellandoFunctionality_Win64> Open(
        DeviceDriver::Generic::EventListener* listener = nullptr);
    /// What was sent since the last call, without the interrupt listener's reads.
    std::vector<std::string> TakeTransfers();

    TestClock clock{TestTime::RealForThreadSanitizer};  // before all that has to do with time
    ScriptedUsbIo driver;

  private:
    Platform::ScopedDeviceFiles files{driver};
};

/// The transcript's line of a vendor request on the device; `data` as in the transcript (" 01 2C").
std::string VendorOut(std::uint8_t request, const std::string& data = {}, std::uint16_t value = 0);
std::string VendorIn(std::uint8_t request, std::uint32_t room);

/// The text of an exception of type `Thrown` that `body` must throw.
template <class Thrown, class Body>
std::string TextOf(Body body) {
    try {
        body();
    } catch (const Thrown& exception) {
        EXPECT_EQ(typeid(exception), typeid(Thrown));
        return exception.what();
    }
    return "nothing thrown";
}

}  // namespace Varnholt::Tests
