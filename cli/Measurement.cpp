#include "Measurement.h"

#include <charconv>

#include "Interface/Readout.h"
#include "Memory/RamAccess.h"
#include "Protocol/PropertyIdentifiers.h"

namespace Varnholt::Cli {
namespace {

using DeviceDriver::Generic::Configuration::Property;
namespace Ids = Protocol::PropertyIds;
namespace Fixed = Interface::FixedReadout;

constexpr std::size_t ParameterCount = 4;

/// With the fixed parameters but for the time.
void SetIntegrationTime(Instrument& instrument, double seconds) {
    RamAccess ram(instrument.SharedCommands());
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

/// Those that are sent as they are.
MeasurementFacts ChosenParameters(const MeasurementOptions& options) {
    if (options.parameters.empty()) {
        return {Fixed::P1, Fixed::P2, Fixed::P3, Fixed::P4};
    }
    const std::vector<std::uint16_t> p = ParseParameters(options.parameters);
    return {p.at(0), p.at(1), p.at(2), static_cast<std::uint8_t>(p.at(3))};
}

std::string CheckParameters(const std::string& text) {
    return ParseParameters(text).empty()
               ? "'" + text + "': three numbers up to 65535 and one up to 255, with commas"
               : "";
}

}  // namespace

void AddMeasurementOptions(CommandSpec command, MeasurementOptions& options) {
    const char* const heading = "Measurement";
    command
        .Add("--integration-time", options.integrationTime,
             "integration time in seconds (default: the fixed 294 time units)")
        .Type("S")
        .Between(1e-9, 1e6)
        .Group(heading);
    command
        .Add("--parameters", options.parameters,
             "the four measurement parameters as they are sent (default: 294,0,1,6)")
        .Type("P1,P2,P3,P4")
        .Check(CheckParameters)
        .Excludes("--integration-time")
        .Group(heading);
}

void PrepareMeasurement(Session& session, Instrument& instrument, const MeasurementOptions& options) {
    if (!session.UserInterruption().Sleep(Fixed::WaitAfterOpening)) {
        session.UserInterruption().ThrowIfRequested();
    }
    if (options.integrationTime > 0) {
        SetIntegrationTime(instrument, options.integrationTime);
    } else {
        const MeasurementFacts sent = ChosenParameters(options);
        instrument.Commands().SetMeasureParameters(sent.p1, sent.p2, sent.p3, sent.p4);
    }
}

MeasurementFacts FactsOf(Instrument& instrument, const MeasurementOptions& options) {
    MeasurementFacts facts = ChosenParameters(options);
    if (options.integrationTime > 0) {
        std::uint8_t p5 = 0;
        instrument.Commands().GetMeasureParameters(facts.p1, facts.p2, facts.p3, facts.p4, p5);
    }
    facts.integrationTime = facts.p1 * RamAccess(instrument.SharedCommands()).TimeUnit();
    return facts;
}

}  // namespace Varnholt::Cli
