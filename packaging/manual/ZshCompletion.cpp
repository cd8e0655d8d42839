#include "Completions.h"

namespace Varnholt::Manual {
namespace {

/// Within single quotes, where `_arguments` and `_describe` read it.
std::string QuotedForZsh(const std::string& text) {
    std::string quoted;
    for (const char c : text) {
        if (c == '\'') {
            quoted += "'\\''";
            continue;
        }
        if (c == ':' || c == '[' || c == ']') {
            quoted += '\\';
        }
        quoted += c;
    }
    return quoted;
}

std::string ActionOf(const OptionDescription& option) {
    switch (option.takes) {
        case Takes::OneOf:
            return "(" + Joined(option.values) + ")";
        case Takes::Instrument:
            return "_ostra_instruments";
        case Takes::Candidate:
            return "_ostra_candidates";
        case Takes::File:
            return "_files";
        case Takes::CommandName:
            return "_ostra_command_names";
        case Takes::Nothing:
        case Takes::Text:
            break;
    }
    return " ";
}

std::string SpecOf(const OptionDescription& option) {
    std::vector<std::string> excluded = option.isRepeated ? std::vector<std::string>() : option.names;
    excluded.insert(excluded.end(), option.excludes.begin(), option.excludes.end());
    std::string spec = "'(" + Joined(excluded) + ")'" + (option.isRepeated ? "'*'" : "");
    if (option.names.size() > 1) {
        spec += "{" + option.names.front() + "," + option.names.back() + "}";
    } else {
        spec += option.names.front();
    }
    spec += "'[" + QuotedForZsh(option.about) + "]";
    if (option.takes != Takes::Nothing) {
        spec +=
            (option.isValueOptional ? "::" : ":") + QuotedForZsh(option.placeholder) + ":" + ActionOf(option);
    }
    return spec + "'";
}

std::string FunctionOf(const CommandDescription& command) {
    std::string text =
        FunctionName(command) +
        "() {\n    local curcontext=\"$curcontext\" state\n    local -a commands line\n    _arguments -C";
    for (const OptionDescription& option : command.options) {
        text += " \\\n        " + SpecOf(option);
    }
    for (const OptionDescription& argument : command.arguments) {
        text += " \\\n        '" +
                std::string(argument.isRepeated   ? "*"
                            : argument.isRequired ? ""
                                                  : ":") +
                ":" + QuotedForZsh(argument.names.front()) + ":" + ActionOf(argument) + "'";
    }
    if (command.commands.empty()) {
        return text + "\n}\n\n";
    }
    text +=
        " \\\n        '1: :->command' '*:: :->words'\n    case $state in\n    command)\n        commands=(\n";
    for (const CommandDescription& next : command.commands) {
        text += "            '" + next.name + ":" + QuotedForZsh(next.about) + "'\n";
    }
    text += "        )\n        _describe command commands ;;\n    words)\n        case $words[1] in\n";
    for (const CommandDescription& next : command.commands) {
        text += "        " + next.name + ") " + FunctionName(next) + " ;;\n";
    }
    return text + "        esac ;;\n    esac\n}\n\n";
}

}  // namespace

std::string ZshCompletion(const CommandDescription& program) {
    std::string text = "#compdef " + program.name + "\n# Completion of " + program.name + " for zsh\n\n";
    if (!program.commands.empty()) {
        text +=
            "_ostra_instruments() {\n    local -a names\n    names=(${(f)\"$(" +
            std::string(ListInstruments) +
            ")\"})\n    _describe instrument names\n}\n\n_ostra_candidates() {\n    local -a numbers\n    "
            "numbers=(${(f)\"$(" +
            std::string(ListCandidates) +
            ")\"})\n    compadd -a numbers\n}\n\n_ostra_command_names() {\n    local -a names\n  "
            "  names=(";
        for (const CommandDescription& command : program.commands) {
            text += command.name + " ";
        }
        text.back() = ')';
        text += "\n    _describe command names\n}\n\n";
    }
    VisitAll(program, [&text](const CommandDescription& command) { text += FunctionOf(command); });
    return text + FunctionName(program) + " \"$@\"\n";
}

}  // namespace Varnholt::Manual
