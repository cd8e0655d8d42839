#include "CommandSpec.h"

#include <fmt/format.h>

#include <charconv>
#include <CLI/CLI.hpp>
#include <concepts>
#include <limits>
#include <utility>

#include "Service/Number.h"

namespace Varnholt::Cli {
namespace {

/// Numbers are read as all numbers of a command line: the parser itself would take a leading zero for octal.
template <class Integer>
std::string ReadWholeNumber(std::string& text) {
    const auto number = Service::ParseNumber<Integer>(text);
    if (!number) {
        return fmt::format("'{}' is no whole number up to {}", text, std::numeric_limits<Integer>::max());
    }
    text = std::to_string(*number);
    return {};
}

std::string CheckRange(const std::string& text, const OptionTraits::Range& range) {
    double value = 0;
    const char* const end = text.data() + text.size();
    const auto parsed = std::from_chars(text.data(), end, value);
    // What is no number at all ("nan") is in no range.
    if (parsed.ec == std::errc() && parsed.ptr == end && value >= range.lowest && value <= range.highest) {
        return {};
    }
    return fmt::format("Value {} not in range {:.12g} to {:.12g}", text, range.lowest, range.highest);
}

}  // namespace

CommandSpec CommandSpec::AddCommand(const char* name, const char* about) {
    return CommandSpec(command_->add_subcommand(name, about));
}

CommandSpec CommandSpec::AddGroup(const char* name, const char* about) {
    CLI::App* const group = command_->add_subcommand(name, about);
    group->require_subcommand(1);
    return CommandSpec(group);
}

template <class Target>
void CommandSpec::Add(const char* names, Target& target, const char* about, const OptionTraits& traits) {
    CLI::Option* option = nullptr;
    // The checks have no words of their own in the help: the option's text says it.
    if constexpr (std::same_as<Target, bool>) {
        option = command_->add_flag(names, target, about);
    } else {
        option = command_->add_option(names, target, about);
    }
    if constexpr (std::same_as<Target, std::string>) {
        option->check([](const std::string& text) { return std::string(text.empty() ? "is empty" : ""); },
                      "");
    } else if constexpr (std::same_as<Target, std::uint32_t>) {
        option->transform(CLI::Validator(ReadWholeNumber<std::uint32_t>, ""));
    } else if constexpr (std::same_as<Target, std::uint16_t> ||
                         std::same_as<Target, std::vector<std::uint16_t>>) {
        option->transform(CLI::Validator(ReadWholeNumber<std::uint16_t>, ""));
    }
    if (traits.type != nullptr) {
        option->type_name(traits.type);
    } else if (option->get_positional() && option->get_lnames().empty()) {
        option->type_name("");  // its name says what it is
    }
    if (heading_ != nullptr) {
        option->group(heading_);
    }
    option->required(traits.isRequired);
    for (const char* const other : traits.excludes) {
        option->excludes(other);
    }
    if (traits.between) {
        option->check([range = *traits.between](const std::string& text) { return CheckRange(text, range); },
                      "");
    }
    if (!traits.oneOf.empty()) {
        // The name is for whoever wants to know the values.
        option->check(CLI::IsMember(traits.oneOf)
                          .description("")
                          .name("{" + CLI::detail::join(traits.oneOf, ",") + "}"));
    }
    if (traits.check != nullptr) {
        option->check(traits.check, "");
    }
}

template void CommandSpec::Add(const char*, bool&, const char*, const OptionTraits&);
template void CommandSpec::Add(const char*, std::string&, const char*, const OptionTraits&);
template void CommandSpec::Add(const char*, double&, const char*, const OptionTraits&);
template void CommandSpec::Add(const char*, std::uint16_t&, const char*, const OptionTraits&);
template void CommandSpec::Add(const char*, std::uint32_t&, const char*, const OptionTraits&);
template void CommandSpec::Add(const char*, std::vector<std::string>&, const char*, const OptionTraits&);
template void CommandSpec::Add(const char*, std::vector<std::uint16_t>&, const char*, const OptionTraits&);

void CommandSpec::Footer(const char* text) {
    command_->footer(text);
}

void CommandSpec::WhenChosen(std::function<void()> call) {
    command_->callback(std::move(call));
}

}  // namespace Varnholt::Cli
