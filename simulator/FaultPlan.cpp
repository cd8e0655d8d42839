#include "FaultPlan.h"

#include <algorithm>
#include <charconv>
#include <stdexcept>

#include "Protocol/EndpointNames.h"

namespace Varnholt::Simulator {
namespace {

using Argument = FaultName::Argument;
using Protocol::EndpointName;
using Protocol::EndpointNames;

constexpr std::array Names{
    FaultName{FaultKind::Stall, "stall", Argument::None, ""},
    FaultName{FaultKind::IoError, "io-error", Argument::None, ""},
    FaultName{FaultKind::Overflow, "overflow", Argument::None, ""},
    FaultName{FaultKind::Silent, "silent", Argument::None, ""},
    FaultName{FaultKind::Short, "short", Argument::Optional, "BYTES"},
    FaultName{FaultKind::Empty, "empty", Argument::None, ""},
    FaultName{FaultKind::Long, "long", Argument::None, ""},
    FaultName{FaultKind::Stale, "stale", Argument::None, ""},
    FaultName{FaultKind::Garbage, "garbage", Argument::None, ""},
    FaultName{FaultKind::Flip, "flip", Argument::Optional, "BIT"},
    FaultName{FaultKind::Late, "late", Argument::Required, "MILLISECONDS"},
    FaultName{FaultKind::LateCancel, "late-cancel", Argument::None, ""},
    FaultName{FaultKind::GoneBefore, "gone-before", Argument::None, ""},
    FaultName{FaultKind::GoneDuring, "gone-during", Argument::None, ""},
    FaultName{FaultKind::GoneAfter, "gone-after", Argument::None, ""},
};

[[noreturn]] void Refuse(std::string_view fault, const std::string& reason) {
    throw std::invalid_argument("fault plan: \"" + std::string(fault) + "\": " + reason);
}

std::string_view Trimmed(std::string_view text) {
    constexpr std::string_view blanks = " \t\r\n";
    const auto first = text.find_first_not_of(blanks);
    return first == text.npos ? std::string_view()
                              : text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

std::optional<std::uint32_t> Number(std::string_view text) {
    std::uint32_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc() && end == text.data() + text.size() ? std::optional(number) : std::nullopt;
}

template <class Names>
std::string Joined(const Names& names) {
    std::string text;
    for (const auto& entry : names) {
        text += (text.empty() ? "" : ", ") + std::string(entry.name);
    }
    return text;
}

/// "bulk-in 7+" in front of the colon.
void ParsePlace(std::string_view text, std::string_view place, Fault& fault) {
    if (const auto blank = place.find_last_of(" \t"); blank != place.npos) {
        const std::string_view name = Trimmed(place.substr(0, blank));
        const auto* const known = std::ranges::find(EndpointNames, name, &EndpointName::name);
        if (known == EndpointNames.end()) {
            Refuse(text, "unknown transfers \"" + std::string(name) + "\"; known: " + Joined(EndpointNames));
        }
        fault.endpoint = known->endpoint;
        place = place.substr(blank + 1);
    }
    if (place.ends_with('+')) {
        fault.fromThenOn = true;
        place.remove_suffix(1);
    }
    const auto index = Number(place);
    if (!index) {
        Refuse(text, "\"" + std::string(place) + "\" is no transfer index");
    }
    fault.index = *index;
}

/// "short=10" behind the colon.
void ParseKind(std::string_view text, std::string_view kind, Fault& fault) {
    const auto equals = kind.find('=');
    const std::string_view name = Trimmed(kind.substr(0, equals));
    const auto known = std::ranges::find(Names, name, &FaultName::name);
    if (known == Names.end()) {
        Refuse(text, "unknown fault \"" + std::string(name) + "\"; known: " + Joined(Names));
    }
    fault.kind = known->kind;
    if (equals == kind.npos) {
        if (known->argument == Argument::Required) {
            Refuse(text, "needs a number: " + std::string(name) + "=" + std::string(known->argumentName));
        }
        return;
    }
    if (known->argument == Argument::None) {
        Refuse(text, std::string(name) + " takes no number");
    }
    const std::string_view number = Trimmed(kind.substr(equals + 1));
    fault.argument = Number(number);
    if (!fault.argument) {
        Refuse(text, "\"" + std::string(number) + "\" is no number");
    }
}

Fault ParseFault(std::string_view text) {
    const auto colon = text.find(':');
    if (colon == text.npos) {
        Refuse(text, "expected INDEX:FAULT, as in 3:stall");
    }
    Fault fault;
    ParsePlace(text, Trimmed(text.substr(0, colon)), fault);
    ParseKind(text, Trimmed(text.substr(colon + 1)), fault);
    return fault;
}

}  // namespace

std::span<const FaultName> AllFaults() {
    return Names;
}

FaultPlan FaultPlan::Parse(std::string_view text) {
    std::vector<Fault> faults;
    while (!text.empty()) {
        const auto end = text.find(';');
        if (const std::string_view fault = Trimmed(text.substr(0, end)); !fault.empty()) {
            faults.push_back(ParseFault(fault));
        }
        text = end == text.npos ? std::string_view() : text.substr(end + 1);
    }
    return FaultPlan(std::move(faults));
}

bool FaultPlan::Uses(FaultKind kind) const {
    return std::ranges::find(faults_, kind, &Fault::kind) != faults_.end();
}

std::optional<Fault> FaultScript::Next(std::uint8_t endpoint) {
    const std::lock_guard lock(mutex_);
    const std::size_t place = Protocol::PlaceOfEndpoint(endpoint);
    const std::uint32_t inAll = all_++;
    const std::uint32_t inOwn = counts_[place]++;
    for (const Fault& fault : plan_.Faults()) {
        if (fault.endpoint && fault.endpoint != EndpointNames[place].endpoint) {
            continue;
        }
        const std::uint32_t index = fault.endpoint ? inOwn : inAll;
        if (index == fault.index || (fault.fromThenOn && index > fault.index)) {
            ++hits_;
            return fault;
        }
    }
    return std::nullopt;
}

std::uint32_t FaultScript::Hits() const {
    const std::lock_guard lock(mutex_);
    return hits_;
}

}  // namespace Varnholt::Simulator
