#include "CommandSpec.h"

#include <CLI/CLI.hpp>
#include <utility>

namespace Varnholt::Cli {

// The checks have no words of their own in the help: the option's text says it.

OptionSpec& OptionSpec::Type(const char* placeholder) {
    option->type_name(placeholder);
    return *this;
}

OptionSpec& OptionSpec::Group(const char* heading) {
    option->group(heading);
    return *this;
}

OptionSpec& OptionSpec::Required() {
    option->required();
    return *this;
}

OptionSpec& OptionSpec::Excludes(const char* name) {
    option->excludes(name);
    return *this;
}

OptionSpec& OptionSpec::Needs(const char* name) {
    option->needs(name);
    return *this;
}

OptionSpec& OptionSpec::Between(double lowest, double highest) {
    option->check(CLI::Range(lowest, highest).description(""));
    return *this;
}

OptionSpec& OptionSpec::OneOf(const std::vector<std::string>& values) {
    option->check(CLI::IsMember(values).description(""));
    return *this;
}

OptionSpec& OptionSpec::Check(std::function<std::string(const std::string& text)> check) {
    option->check(CLI::Validator([check = std::move(check)](std::string& text) { return check(text); }, ""));
    return *this;
}

CommandSpec CommandSpec::AddCommand(const char* name, const char* about) {
    return CommandSpec(command->add_subcommand(name, about));
}

CommandSpec CommandSpec::AddGroup(const char* name, const char* about) {
    CLI::App* const group = command->add_subcommand(name, about);
    group->require_subcommand(1);
    return CommandSpec(group);
}

template <class Target>
OptionSpec CommandSpec::AddOption(const char* names, Target& target, const char* about) {
    CLI::Option* const option = command->add_option(names, target, about);
    if (option->get_positional()) {
        option->type_name("");  // its name says what it is
    }
    return OptionSpec(option);
}

OptionSpec CommandSpec::Add(const char* names, std::string& target, const char* about) {
    return AddOption(names, target, about).Check([](const std::string& text) {
        return std::string(text.empty() ? "is empty" : "");
    });
}

OptionSpec CommandSpec::Add(const char* names, double& target, const char* about) {
    return AddOption(names, target, about);
}

OptionSpec CommandSpec::Add(const char* names, std::uint16_t& target, const char* about) {
    return AddOption(names, target, about);
}

OptionSpec CommandSpec::Add(const char* names, std::uint32_t& target, const char* about) {
    return AddOption(names, target, about);
}

OptionSpec CommandSpec::Add(const char* names, std::vector<std::string>& target, const char* about) {
    return AddOption(names, target, about);
}

OptionSpec CommandSpec::Add(const char* names, std::vector<std::uint16_t>& target, const char* about) {
    return AddOption(names, target, about);
}

OptionSpec CommandSpec::AddFlag(const char* names, bool& target, const char* about) {
    return OptionSpec(command->add_flag(names, target, about));
}

void CommandSpec::Footer(const char* text) {
    command->footer(text);
}

void CommandSpec::WhenChosen(std::function<void()> call) {
    command->callback(std::move(call));
}

}  // namespace Varnholt::Cli
