#include "Service/Instruments.h"

#include <fmt/format.h>

#include <algorithm>
#include <iterator>
#include <string_view>

#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "Service/Number.h"
#include "Service/OpenedInstrument.h"
#include "Service/SystemAdvice.h"

namespace Varnholt::Service {
namespace {

using DeviceDriver::Ostra::USB::USBBrowser;

constexpr std::string_view ChipPrefix = "chip:";
constexpr std::size_t ChipDigits = 16;
constexpr const char* ShowChips = "`ostra list --chip-id` shows the chip ids";

/// They are asked one after the other, up to the one that fits.
std::string FindByChipId(Context& context, const std::vector<std::string>& identifiers,
                         const std::string& name) {
    const auto wanted = ParseHexadecimal(name.substr(ChipPrefix.size()), ChipDigits);
    if (!wanted) {
        throw Failure(FailureKind::BadArgument,
                      "'" + name + "' names no chip: an id has 16 hexadecimal digits", ShowChips);
    }
    std::vector<std::string> notAsked;
    FailureKind kind = FailureKind::NotFound;
    for (const std::string& identifier : identifiers) {
        const ChipIdAnswer answer = AskChipId(context, identifier);
        if (answer.chipId == wanted) {
            return identifier;
        }
        if (answer.problem) {
            kind = notAsked.empty() ? answer.problem->Kind() : kind;
            notAsked.emplace_back(answer.problem->what());
        }
    }
    throw Failure(kind,
                  notAsked.empty() ? "no instrument " + name + " is connected"
                                   : fmt::format("no instrument that could be asked is {}; not asked: {}",
                                                 name, fmt::join(notAsked, "; ")),
                  ShowChips);
}

}  // namespace

std::vector<std::string> ListInstruments(const Context& context) {
    try {
        const auto paths = USBBrowser::Instance(context.UsedTransport())->GetDevices(0);
        return {paths.begin(), paths.end()};
    } catch (...) {
        throw context.Explain(std::current_exception());
    }
}

bool IsConnected(const Context& context, const std::string& identifier) {
    try {
        const auto connected = ListInstruments(context);
        return std::ranges::find(connected, identifier) != connected.end();
    } catch (...) {
        return true;
    }
}

std::string ShortNameOf(const std::string& identifier) {
    // Windows: \\?\usb#vid_1234&pid_5678#NAME#{interface class}
    if (identifier.starts_with("\\\\")) {
        const std::size_t end = identifier.rfind('#');
        const std::size_t begin = identifier.rfind('#', end - 1);
        return begin == std::string::npos ? identifier : identifier.substr(begin + 1, end - begin - 1);
    }
    return identifier.substr(identifier.rfind('/') + 1);
}

FoundInstrument FindInstrument(Context& context, const std::string& name) {
    FoundInstrument found{ListInstruments(context)};
    const bool isChip = name.starts_with(ChipPrefix) && !found.connected.empty();
    found.index =
        FindInstrument(found.connected, isChip ? FindByChipId(context, found.connected, name) : name);
    return found;
}

std::size_t FindInstrument(const std::vector<std::string>& identifiers, const std::string& name) {
    if (identifiers.empty()) {
        throw Failure(FailureKind::NotFound, "no instrument is connected", NoInstrumentAdvice);
    }
    if (name.empty()) {
        return 0;
    }
    using Fits = bool (*)(const std::string& identifier, const std::string& name);
    constexpr Fits ways[]{
        [](const std::string& identifier, const std::string& wanted) { return identifier == wanted; },
        [](const std::string& identifier, const std::string& wanted) {
            return ShortNameOf(identifier) == wanted;
        },
        [](const std::string& identifier, const std::string& wanted) {
            return identifier.ends_with(wanted) || ShortNameOf(identifier).ends_with(wanted);
        },
    };
    for (const Fits fits : ways) {
        std::vector<std::string> found;
        std::ranges::copy_if(identifiers, std::back_inserter(found),
                             [&](const std::string& identifier) { return fits(identifier, name); });
        if (found.size() > 1) {
            throw Failure(FailureKind::NotFound, "'" + name + "' fits several instruments",
                          fmt::format("name one of them: {}", fmt::join(found, ", ")));
        }
        if (found.size() == 1) {
            return static_cast<std::size_t>(std::ranges::find(identifiers, found.front()) -
                                            identifiers.begin());
        }
    }
    throw Failure(FailureKind::NotFound, "no instrument '" + name + "' is connected",
                  fmt::format("connected: {}", fmt::join(identifiers, ", ")));
}

ChipIdAnswer AskChipId(Context& context, const std::string& identifier) {
    try {
        return {OpenedInstrument(context, FindInstrument(context, identifier)).ChipId(), {}};
    } catch (const Failure& failure) {
        if (failure.Kind() == FailureKind::Interrupted) {
            throw;
        }
        return {{}, failure};
    }
}

}  // namespace Varnholt::Service
