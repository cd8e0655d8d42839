#include "ReadCommandLine.h"

#include <fmt/format.h>

#include <algorithm>
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <set>

namespace Varnholt::Manual {
namespace {

std::vector<CLI::Validator*> ValidatorsOf(CLI::Option& option) {
    std::vector<CLI::Validator*> validators;
    try {
        for (int i = 0;; ++i) {
            validators.push_back(option.get_validator(i));
        }
    } catch (const CLI::OptionNotFound&) {
        return validators;  // the parser has no other way to tell how many there are
    }
}

/// The members of a set: "{a,b}", in the name of the check or in what it says of itself.
std::vector<std::string> ValuesOf(CLI::Option& option) {
    for (const CLI::Validator* const validator : ValidatorsOf(option)) {
        for (const std::string& text : {validator->get_name(), validator->get_description()}) {
            if (text.starts_with('{') && text.ends_with('}')) {
                return CLI::detail::split(text.substr(1, text.size() - 2), ',');
            }
        }
    }
    return {};
}

/// "from 1 to 100", of a check that says "INT in [1 - 100]".
std::string RangeOf(CLI::Option& option) {
    for (const CLI::Validator* const validator : ValidatorsOf(option)) {
        const std::string text = validator->get_description();
        const std::size_t begin = text.find(" in [");
        const std::size_t middle = text.find(" - ");
        if (begin != std::string::npos && middle != std::string::npos) {
            return fmt::format("from {:.15g} to {:.15g}", std::stod(text.substr(begin + 5)),
                               std::stod(text.substr(middle + 3)));
        }
    }
    return {};
}

std::string PlaceholderOf(const CLI::Option& option) {
    const std::string type = option.get_type_name();
    const std::string word = type.substr(0, type.find(':'));
    return word == "UINT" || word == "FLOAT" ? "NUMBER" : word;
}

std::vector<std::string> NamesOf(const CLI::Option& option) {
    std::vector<std::string> names;
    for (const std::string& name : option.get_snames()) {
        names.push_back("-" + name);
    }
    for (const std::string& name : option.get_lnames()) {
        names.push_back("--" + name);
    }
    return names;
}

Takes WhatIsTaken(const CLI::Option& option, const OptionDescription& description) {
    if (option.get_items_expected_max() == 0) {
        return Takes::Nothing;
    }
    if (!description.values.empty()) {
        return Takes::OneOf;
    }
    if (option.check_lname("device")) {
        return Takes::Instrument;
    }
    if (option.check_name("VID:PID")) {
        return Takes::Candidate;
    }
    if (option.check_name("COMMAND")) {
        return Takes::CommandName;
    }
    const bool isFile =
        option.get_type_name() == "FILE" || description.about.find("file") != std::string::npos;
    return isFile ? Takes::File : Takes::Text;
}

template <class Options>
std::vector<std::string> NamesOfAll(const Options& options) {
    std::set<std::string> names;  // the parser has them in the order of their addresses
    for (const CLI::Option* const option : options) {
        names.insert(option->get_name());
    }
    return {names.begin(), names.end()};
}

OptionDescription Describe(CLI::Option& option) {
    OptionDescription description;
    description.names = NamesOf(option);
    description.about = option.get_description();
    if (const std::string range = RangeOf(option); !range.empty()) {
        description.about += ", " + range;
    }
    description.heading = option.get_group();
    description.byDefault = option.get_default_str();
    description.values = ValuesOf(option);
    description.takes = WhatIsTaken(option, description);
    if (description.takes != Takes::Nothing) {
        description.placeholder = PlaceholderOf(option);
    }
    description.excludes = NamesOfAll(option.get_excludes());
    description.needs = NamesOfAll(option.get_needs());
    description.isRequired = option.get_required();
    description.isRepeated = option.get_expected_max() > 1;
    description.isValueOptional = option.get_expected_min() == 0;
    return description;
}

CommandDescription Describe(CLI::App& command, std::vector<std::string> path) {
    path.push_back(command.get_name());
    CommandDescription description;
    description.name = command.get_name();
    description.about = command.get_description();
    description.footer = command.get_footer();
    for (CLI::Option* const option :
         command.get_options([](CLI::Option* known) { return !known->get_group().empty(); })) {
        OptionDescription known = Describe(*option);
        if (option->get_positional()) {
            OptionDescription argument = known;
            argument.names = {option->get_name(true)};
            if (!known.names.empty()) {
                argument.about = "the same as `" + known.names.back() + "`";
            }
            description.arguments.push_back(argument);
        }
        if (!known.names.empty()) {
            description.options.push_back(std::move(known));
        }
    }
    for (CLI::App* const next :
         command.get_subcommands([](CLI::App* known) { return !known->get_group().empty(); })) {
        description.commands.push_back(Describe(*next, path));
    }
    description.path = std::move(path);
    return description;
}

}  // namespace

CommandDescription ReadCommandLine(CLI::App& program) {
    return Describe(program, {});
}

}  // namespace Varnholt::Manual
