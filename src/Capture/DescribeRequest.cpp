#include "Capture/DescribeRequest.h"

#include <array>
#include <string_view>

#include "Protocol/EndpointNames.h"

namespace Varnholt::Capture {

using namespace Protocol;
namespace {

using namespace DataStage;

/// One number of a request's data stage, most significant byte first.
struct Field {
    std::string_view name;
    std::size_t offset;
    std::size_t size;
};

struct Description {
    Request request;
    std::string_view name;
    std::array<Field, 6> fields;
};

constexpr std::array Descriptions{
    Description{Request::DownloadRamFirmware, "DownloadRAMFirmware", {}},
    Description{Request::Measure, "Measure", {}},
    Description{Request::SetMeasureParameters,
                "SetMeasureParameters",
                {{{"p1", P1, 2}, {"p2", P2, 2}, {"p3", P3, 2}, {"p4", P4, 1}}}},
    Description{Request::GetMeasureParameters,
                "GetMeasureParameters",
                {{{"p1", P1, 2}, {"p2", P2, 2}, {"p3", P3, 2}, {"p4", P4, 1}, {"p5", P5, 1}}}},
    Description{Request::WriteEeprom, "WriteEEPROM", {{{"address", Address, 4}, {"length", Length, 2}}}},
    Description{Request::ReadEeprom, "ReadEEPROM", {{{"address", Address, 4}, {"length", Length, 2}}}},
    Description{Request::WriteCpld, "WriteCPLD", {{{"c1", C1, 2}, {"c2", C2, 2}, {"c3", C3, 2}}}},
    Description{Request::ReadCpld, "ReadCPLD", {{{"value", 0, 2}}}},
    Description{Request::GetMisc,
                "GetMISC",
                {{{"m1", M1, 1}, {"m2", M2, 2}, {"m3", M3, 1}, {"m4", M4, 2}, {"m5", M5, 2}}}},
    Description{Request::Reset, "Reset", {{{"code", 0, 1}}}},
    Description{Request::DownloadEepromFirmware,
                "DownloadEEPROMFirmware",
                {{{"address", Address, 4}, {"length", Length, 2}}}},
    Description{Request::SetMeasureMode, "SetMeasureMode", {{{"mode", 0, 1}}}},
    Description{Request::ButtonReport, "ButtonReport", {}},
    Description{Request::GetMeasureMode,
                "GetMeasureMode",
                {{{"m1", 0, 1}, {"m2", 1, 1}, {"m3", 2, 1}, {"m4", 3, 1}, {"m5", 4, 1}, {"m6", 5, 1}}}},
    Description{Request::GetChipId, "GetChipID", {}},
};

std::uint32_t FieldValue(std::span<const std::uint8_t> data, const Field& field) {
    std::uint32_t value = 0;
    for (const std::uint8_t byte : data.subspan(field.offset, field.size)) {
        value = value << 8 | byte;
    }
    return value;
}

}  // namespace

std::string Hexadecimal(std::uint32_t value, int digits) {
    std::string text;
    for (int digit = digits - 1; digit >= 0; --digit) {
        text += "0123456789ABCDEF"[value >> (4 * digit) & 0xF];
    }
    return text;
}

std::string DescribeRequest(std::uint8_t request, std::uint16_t value, std::span<const std::uint8_t> data) {
    for (const Description& description : Descriptions) {
        if (static_cast<std::uint8_t>(description.request) != request) {
            continue;
        }
        std::string text(description.name);
        for (const Field& field : description.fields) {
            if (field.size > 0 && field.offset + field.size <= data.size()) {
                text += " " + std::string(field.name) + "=" + std::to_string(FieldValue(data, field));
            }
        }
        if (description.request == Request::DownloadRamFirmware) {
            text += " address=0x" + Hexadecimal(value, 4);
        }
        return text;
    }
    return "vendor request 0x" + Hexadecimal(request, 2);
}

std::string DescribeData(std::uint8_t endpoint, std::uint32_t moved, std::uint32_t asked) {
    return std::string(EndpointNames[PlaceOfEndpoint(endpoint)].words) + " " + std::to_string(moved) +
           " of " + std::to_string(asked);
}

}  // namespace Varnholt::Capture
