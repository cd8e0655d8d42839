#include "Commands/MeasurementOptions.h"

#include <charconv>

namespace Varnholt::Cli {
namespace {

constexpr std::size_t ParameterCount = 4;

/// Three 16-bit numbers and a byte, with commas; empty where the text is something else.
std::vector<std::uint16_t> ParseParameters(const std::string& text) {
    std::vector<std::uint16_t> parameters;
    const char* at = text.data();
    const char* const end = at + text.size();
    while (parameters.size() < ParameterCount) {
        std::uint16_t number = 0;
        const auto parsed = std::from_chars(at, end, number);
        const bool isLast = parameters.size() + 1 == ParameterCount;
        if (parsed.ec != std::errc() ||
            (isLast ? parsed.ptr != end : parsed.ptr == end || *parsed.ptr != ',')) {
            return {};
        }
        parameters.push_back(number);
        at = isLast ? end : parsed.ptr + 1;
    }
    return parameters.back() > 0xFF ? std::vector<std::uint16_t>() : parameters;
}

std::string CheckParameters(const std::string& text) {
    return ParseParameters(text).empty()
               ? "'" + text + "': three numbers up to 65535 and one up to 255, with commas"
               : "";
}

}  // namespace

void AddMeasurementOptions(CommandSpec command, MeasurementOptions& options) {
    CommandSpec measurement = command.Under("Measurement");
    measurement.Add("--integration-time", options.integrationTime,
                    "integration time in seconds (default: the fixed 294 time units)",
                    {.type = "S", .between = {{1e-9, 1e6}}});
    measurement.Add("--parameters", options.parameters,
                    "the four measurement parameters as they are sent (default: 294,0,1,6)",
                    {.type = "P1,P2,P3,P4", .excludes = {"--integration-time"}, .check = CheckParameters});
}

Service::MeasurementSettings MeasurementOptions::Settings() const {
    Service::MeasurementSettings settings{integrationTime, {}};
    if (!parameters.empty()) {
        const std::vector<std::uint16_t> p = ParseParameters(parameters);
        settings.parameters = {p.at(0), p.at(1), p.at(2), static_cast<std::uint8_t>(p.at(3))};
    }
    return settings;
}

}  // namespace Varnholt::Cli
