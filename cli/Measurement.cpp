#include "Measurement.h"

#include <charconv>

#include "Commands/CommandLine.h"
#include "Interface/Readout.h"
#include "Memory/RamAccess.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/PropertyIdentifiers.h"

namespace Varnholt::Cli {
namespace {

using DeviceDriver::Generic::Configuration::Property;
namespace Ids = Protocol::PropertyIds;
namespace Fixed = Interface::FixedReadout;

constexpr std::int32_t HighestPositive = 0xF800;

/// With the fixed parameters but for the time.
void SetIntegrationTime(Instrument& instrument, double seconds) {
    RamAccess ram(instrument);
    auto set = ram.Load();
    set.SetProperty(Ids::IntegrationTime, Property(static_cast<float>(seconds)));
    set.SetProperty(Ids::SecondTime, Property(0.0F));
    set.SetProperty(Ids::ThirdParameter, Property(std::int32_t{Fixed::P3}));
    const auto setFlag = [&set](std::uint16_t id, int bit) {
        set.SetProperty(id, Property(std::int32_t{Fixed::P4 >> bit & 1}));
    };
    setFlag(Ids::FlagBit0, 0);
    setFlag(Ids::FlagBit1, 1);
    setFlag(Ids::FlagBit2, 2);
    setFlag(Ids::FlagBit3, 3);
    ram.Store(set);
}

/// Three 16-bit numbers and a byte.
std::vector<std::uint16_t> ParseParameters(const std::string& text) {
    std::vector<std::uint16_t> parameters;
    for (const std::string& part : CLI::detail::split(text, ',')) {
        std::uint16_t number = 0;
        const char* const end = part.data() + part.size();
        const auto parsed = std::from_chars(part.data(), end, number);
        if (parsed.ec != std::errc() || parsed.ptr != end) {
            parameters.clear();
            break;
        }
        parameters.push_back(number);
    }
    if (parameters.size() != 4 || parameters.back() > 0xFF) {
        throw CLI::ValidationError(
            "--parameters", "'" + text + "': three numbers up to 65535 and one up to 255, with commas");
    }
    return parameters;
}

}  // namespace

void AddMeasurementOptions(CLI::App* command, MeasurementOptions& options) {
    const char* const group = "Measurement";
    auto* const time = command
                           ->add_option("--integration-time", options.integrationTime,
                                        "integration time in seconds (default: the fixed 294 time units)")
                           ->type_name("S")
                           ->check(Silent(CLI::PositiveNumber))
                           ->group(group);
    command
        ->add_option_function<std::string>(
            "--parameters",
            [&options](const std::string& text) { options.parameters = ParseParameters(text); },
            "the four measurement parameters as they are sent (default: 294,0,1,6)")
        ->type_name("P1,P2,P3,P4")
        ->excludes(time)
        ->group(group);
}

void PrepareMeasurement(Session& session, Instrument& instrument, const MeasurementOptions& options) {
    if (!session.UserInterruption().Sleep(Fixed::WaitAfterOpening)) {
        session.UserInterruption().ThrowIfRequested();
    }
    if (options.integrationTime > 0) {
        SetIntegrationTime(instrument, options.integrationTime);
    } else if (!options.parameters.empty()) {
        instrument.Commands().SetMeasureParameters(options.parameters[0], options.parameters[1],
                                                   options.parameters[2],
                                                   static_cast<std::uint8_t>(options.parameters[3]));
    } else {
        instrument.Commands().SetMeasureParameters(Fixed::P1, Fixed::P2, Fixed::P3, Fixed::P4);
    }
}

std::vector<std::int32_t> ValuesOf(std::span<const std::uint8_t> record) {
    std::vector<std::int32_t> values;
    for (std::size_t i = 0; i + 1 < record.size(); i += 2) {
        const std::int32_t value = Protocol::LoadBig16(record.data() + i);
        values.push_back(value > HighestPositive ? value - 0x10000 : value);
    }
    return values;
}

}  // namespace Varnholt::Cli
