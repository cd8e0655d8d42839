#include "UsbIoTransportFixture.h"

#include <cstdio>

namespace Varnholt::Tests {

using DeviceDriver::Ostra::LowLevel::PellandoFunctionality_Win64;

UsbIoTransportFixture::UsbIoTransportFixture() {
    Platform::Override64BitHost(true);
}

UsbIoTransportFixture::~UsbIoTransportFixture() {
    Platform::Override64BitHost(std::nullopt);
    EXPECT_EQ(driver.OpenFiles(), 0U);
}

std::unique_ptr<PellandoFunctionality_Win64> UsbIoTransportFixture::Open(
    DeviceDriver::Generic::EventListener* listener) {
    auto opened = std::make_unique<PellandoFunctionality_Win64>(listener, 0);
    driver.TakeTranscript();
    return opened;
}

std::vector<std::string> UsbIoTransportFixture::TakeTransfers() {
    std::vector<std::string> lines = driver.TakeTranscript();
    std::erase_if(lines, [](const std::string& line) {
        return line.rfind("read 84", 0) == 0 || line.rfind("cancel 84", 0) == 0;
    });
    return lines;
}

namespace {
std::string RequestBlock(std::uint8_t request, std::uint16_t value) {
    char text[80];
    std::snprintf(text, sizeof text, " 00 00 00 00 02 00 00 00 00 00 00 00 00 %02X %02X %02X 00 00 /",
                  request, value & 0xFFU, value >> 8U);
    return text;
}
}  // namespace

std::string VendorOut(std::uint8_t request, const std::string& data, std::uint16_t value) {
    return "control 80942035" + RequestBlock(request, value) + data;
}

std::string VendorIn(std::uint8_t request, std::uint32_t room) {
    return "control 80942032" + RequestBlock(request, 0) + " [" + std::to_string(room) + "]";
}

}  // namespace Varnholt::Tests
