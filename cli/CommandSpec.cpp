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
CLI::Validator WholeNumber() {
    return CLI::Validator(
        [](std::string& text) -> std::string {
            const auto most = std::numeric_limits<Integer>::max();
            std::uint64_t number = 0;
            if (!Service::ParseNumber(text, most, number)) {
                return fmt::format("'{}' is no whole number up to {}", text, most);
            }
            text = std::to_string(number);
            return {};
        },
        "");
}

}  // namespace

// The checks have no words of their own in the help: the option's text says it.

OptionSpec& OptionSpec::Type(const char* placeholder) {
    option_->type_name(placeholder);
    return *this;
}

OptionSpec& OptionSpec::Group(const char* heading) {
    option_->group(heading);
    return *this;
}

OptionSpec& OptionSpec::Required() {
    option_->required();
    return *this;
}

OptionSpec& OptionSpec::Excludes(const char* name) {
    option_->excludes(name);
    return *this;
}

OptionSpec& OptionSpec::Between(double lowest, double highest) {
    return Check([lowest, highest](const std::string& text) -> std::string {
        double value = 0;
        const char* const end = text.data() + text.size();
        const auto parsed = std::from_chars(text.data(), end, value);
        // What is no number at all ("nan") is in no range.
        if (parsed.ec == std::errc() && parsed.ptr == end && value >= lowest && value <= highest) {
            return {};
        }
        return fmt::format("Value {} not in range {:.12g} to {:.12g}", text, lowest, highest);
    });
}

OptionSpec& OptionSpec::OneOf(const std::vector<std::string>& values) {
    // The name is for whoever wants to know the values.
    option_->check(CLI::IsMember(values).description("").name("{" + CLI::detail::join(values, ",") + "}"));
    return *this;
}

OptionSpec& OptionSpec::Check(std::function<std::string(const std::string& text)> check) {
    option_->check(CLI::Validator([check = std::move(check)](std::string& text) { return check(text); }, ""));
    return *this;
}

CommandSpec CommandSpec::AddCommand(const char* name, const char* about) {
    return CommandSpec(command_->add_subcommand(name, about));
}

CommandSpec CommandSpec::AddGroup(const char* name, const char* about) {
    CLI::App* const group = command_->add_subcommand(name, about);
    group->require_subcommand(1);
    return CommandSpec(group);
}

template <class Target>
OptionSpec CommandSpec::Add(const char* names, Target& target, const char* about) {
    CLI::Option* const option = command_->add_option(names, target, about);
    if (option->get_positional() && option->get_lnames().empty()) {
        option->type_name("");  // its name says what it is
    }
    OptionSpec spec(option);
    if constexpr (std::same_as<Target, std::string>) {
        spec.Check([](const std::string& text) { return std::string(text.empty() ? "is empty" : ""); });
    } else if constexpr (std::same_as<Target, std::uint32_t>) {
        option->transform(WholeNumber<std::uint32_t>());
    } else if constexpr (std::same_as<Target, std::uint16_t> ||
                         std::same_as<Target, std::vector<std::uint16_t>>) {
        option->transform(WholeNumber<std::uint16_t>());
    }
    return spec;
}

template OptionSpec CommandSpec::Add(const char*, std::string&, const char*);
template OptionSpec CommandSpec::Add(const char*, double&, const char*);
template OptionSpec CommandSpec::Add(const char*, std::uint16_t&, const char*);
template OptionSpec CommandSpec::Add(const char*, std::uint32_t&, const char*);
template OptionSpec CommandSpec::Add(const char*, std::vector<std::string>&, const char*);
template OptionSpec CommandSpec::Add(const char*, std::vector<std::uint16_t>&, const char*);

OptionSpec CommandSpec::AddFlag(const char* names, bool& target, const char* about) {
    return OptionSpec(command_->add_flag(names, target, about));
}

void CommandSpec::Footer(const char* text) {
    command_->footer(text);
}

void CommandSpec::WhenChosen(std::function<void()> call) {
    command_->callback(std::move(call));
}

}  // namespace Varnholt::Cli
