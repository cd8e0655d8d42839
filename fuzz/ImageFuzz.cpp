#include <cstddef>
#include <cstdint>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "FreshEeprom.h"
#include "ImageCheck.h"
#include "Protocol/ByteOrder.h"

using namespace Varnholt;
using namespace DeviceDriver::Ostra::LowLevel;

/// A damaged EEPROM image is refused or loaded, and what its dump holds is read back the same. The input is a
/// list of changes to a fresh image, which reaches deeper than 8192 free bytes would: records of two
/// big-endian numbers. A record whose first number is below 8192 puts its second into the image at that
/// address; any other first number picks the value that is to have as many elements as the second says.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const std::vector<std::uint16_t> ids = [] {
        std::vector<std::uint16_t> all;
        for (const auto* set :
             {&PellandoEAT::GetDefaultLogData(), &PellandoEAT::GetDefaultCalibrationData()}) {
            for (const auto& entry : set->GetDatastore()) {
                all.push_back(entry.first);
            }
        }
        return all;
    }();
    constexpr std::size_t recordSize = 4;
    std::vector<std::uint8_t> image = Simulator::FreshEeprom();
    std::vector<Resize> resizes;
    for (; size >= recordSize; size -= recordSize, data += recordSize) {
        const std::uint16_t place = Protocol::LoadBig16(data);
        const std::uint16_t number = Protocol::LoadBig16(data + 2);
        if (place + sizeof(number) <= image.size()) {
            Protocol::StoreBig16(&image[place], number);
        } else {
            resizes.push_back({ids[place % ids.size()], static_cast<std::uint16_t>(number % 2048)});
        }
    }
    RoundTrips(image, resizes);
    return 0;
}
