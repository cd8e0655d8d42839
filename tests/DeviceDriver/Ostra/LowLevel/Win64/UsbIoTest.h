#pragma once

#include <memory>

#include "DeviceDriver/Ostra/LowLevel/Win64/PellandoFunctionality_Win64.h"
#include "Platform/HostQueries.h"
#include "Protocol/Instrument.h"
#include "Support/DriverTest.h"

namespace Varnholt::Tests {

/// A host on which USBIO is the transport.
class UsbIoTest : public DriverTest {
  protected:
    explicit UsbIoTest(std::vector<std::string> paths = {"usbio/1"})
        : DriverTest(TestTime::RealForThreadSanitizer, std::move(paths)) {
        Platform::Override64BitHost(true);
    }
    ~UsbIoTest() override {
        Platform::Override64BitHost(std::nullopt);
        EXPECT_EQ(driver_.OpenFiles(), 0U);
    }

    /// Opens the first instrument and forgets what that took.
    std::unique_ptr<DeviceDriver::Ostra::LowLevel::PellandoFunctionality_Win64> Open() {
        auto opened =
            std::make_unique<DeviceDriver::Ostra::LowLevel::PellandoFunctionality_Win64>(nullptr, 0);
        driver_.TakeTranscript();
        return opened;
    }
    /// What happened since the last call, without the interrupt listener's reads.
    Lines TakeTranscript() {
        Lines lines = driver_.TakeTranscript();
        std::erase_if(lines, [](const std::string& line) {
            return line.starts_with("read 84") || line.starts_with("cancel 84");
        });
        return lines;
    }
};

}  // namespace Varnholt::Tests
