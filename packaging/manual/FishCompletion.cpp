#include <set>

#include "Completions.h"

namespace Varnholt::Manual {
namespace {

std::string QuotedForFish(const std::string& text) {
    std::string quoted = "'";
    for (const char c : text) {
        quoted += c == '\'' || c == '\\' ? std::string("\\") + c : std::string(1, c);
    }
    return quoted + "'";
}

std::string ValueOf(const OptionDescription& option) {
    switch (option.takes) {
        case Takes::OneOf:
            return " -x -a '" + Joined(option.values) + "'";
        case Takes::Instrument:
            return " -x -a '(__ostra_instruments)'";
        case Takes::Candidate:
            return " -x -a '(__ostra_candidates)'";
        case Takes::File:
            return " -r -F";
        case Takes::Text:
            return option.isValueOptional ? "" : " -x";
        case Takes::Nothing:
        case Takes::CommandName:
            break;
    }
    return {};
}

std::string LinesOf(const CommandDescription& program, const CommandDescription& command) {
    const std::string begin = "complete -c " + program.name + " -n '_" + FunctionName(program) + "_at \"" +
                              PathOf(command, " ") + "\"'";
    std::string text;
    for (const CommandDescription& next : command.commands) {
        text += begin + " -a " + next.name + " -d " + QuotedForFish(next.about) + "\n";
    }
    for (const OptionDescription& option : command.options) {
        text += begin;
        for (const std::string& name : option.names) {
            text += name.starts_with("--") ? " -l " + name.substr(2) : " -s " + name.substr(1);
        }
        text += ValueOf(option) + " -d " + QuotedForFish(option.about) + "\n";
    }
    for (const OptionDescription& argument : command.arguments) {
        if (argument.takes == Takes::Candidate) {
            text += begin + ValueOf(argument) + "\n";
        }
        if (argument.takes == Takes::File) {
            text += begin + " -F\n";
        }
        if (argument.takes == Takes::CommandName) {
            std::vector<std::string> names;
            for (const CommandDescription& next : program.commands) {
                names.push_back(next.name);
            }
            text += begin + " -a '" + Joined(names) + "'\n";
        }
    }
    return text;
}

}  // namespace

std::string FishCompletion(const CommandDescription& program) {
    std::string lines;
    std::string paths;
    std::set<std::string> valued;
    VisitAll(program, [&](const CommandDescription& command) {
        lines += LinesOf(program, command);
        paths += " " + QuotedForFish(PathOf(command, " "));
        for (const OptionDescription& option : command.options) {
            if (option.takes != Takes::Nothing && !option.isValueOptional) {
                valued.insert(option.names.begin(), option.names.end());
            }
        }
    });
    const std::string function = "_" + FunctionName(program);
    std::string text = "# Completion of " + program.name + " for fish\n\n";
    if (!program.commands.empty()) {
        text += "function __ostra_instruments\n    " + std::string(ListInstruments) +
                "\nend\n\nfunction __ostra_candidates\n    " + std::string(ListCandidates) + "\nend\n\n";
    }
    text +=
        "# Whether the command that is being typed is this one.\nfunction " + function +
        "_at\n    set -l path " + program.name +
        "\n    set -l isValue no\n    for word in (commandline -opc)[2..-1]\n        if test $isValue = yes\n"
        "            set isValue no\n        else if contains -- \"$word\" " +
        Joined({valued.begin(), valued.end()}) +
        "\n            set isValue yes\n        else if contains -- \"$path $word\"" + paths +
        "\n            set path \"$path $word\"\n        end\n    end\n    test \"$path\" = $argv[1]\nend\n\n"
        "complete -c " +
        program.name + " -f\n";
    return text + lines;
}

}  // namespace Varnholt::Manual
