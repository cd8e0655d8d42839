#include <algorithm>
#include <map>
#include <stdexcept>

#include "Completions.h"

namespace Varnholt::Manual {
namespace {

/// The shell command that completes a value of `option`; `$current` is what was typed of it.
std::string CompletionOf(const OptionDescription& option) {
    switch (option.takes) {
        case Takes::OneOf:
            return "COMPREPLY=($(compgen -W '" + Joined(option.values) + "' -- \"$current\"))";
        case Takes::Instrument:
            return "COMPREPLY=($(compgen -W \"$(" + std::string(ListInstruments) + ")\" -- \"$current\"))";
        case Takes::Candidate:
            // A colon ends a word for bash, so that only what stands behind it is replaced.
            return "current=${COMP_LINE:0:COMP_POINT}; current=${current##* }\n            "
                   "COMPREPLY=($(compgen -W "
                   "\"$(" +
                   std::string(ListCandidates) +
                   ")\" -- \"$current\"))\n            [[ $current != *:* || $COMP_WORDBREAKS != *:* ]] || "
                   "COMPREPLY=(\"${COMPREPLY[@]#\"${current%:*}:\"}\")";
        case Takes::File:
            return "compopt -o filenames 2>/dev/null; mapfile -t COMPREPLY < <(compgen -f -- \"$current\")";
        case Takes::CommandName:
            return "COMPREPLY=($(compgen -W \"$commands\" -- \"$current\"))";
        case Takes::Nothing:
        case Takes::Text:
            break;
    }
    return ":";
}

/// The rows of a table: what each command knows.
std::string TableRow(const CommandDescription& program, const CommandDescription& command) {
    std::vector<std::string> names;
    std::vector<std::string> valued;
    std::vector<std::string> commands;
    const auto add = [&](const OptionDescription& option) {
        if (std::ranges::find(names, option.names.back()) != names.end()) {
            return;
        }
        names.insert(names.end(), option.names.begin(), option.names.end());
        if (option.takes != Takes::Nothing && !option.isValueOptional) {
            valued.insert(valued.end(), option.names.begin(), option.names.end());
        }
    };
    // The program's own options may stand behind the command as well.
    std::ranges::for_each(command.options, add);
    std::ranges::for_each(program.options, add);
    const bool takesCommandName = std::ranges::any_of(
        command.arguments,
        [](const OptionDescription& argument) { return argument.takes == Takes::CommandName; });
    for (const CommandDescription& next : takesCommandName ? program.commands : command.commands) {
        commands.push_back(next.name);
    }
    return "        '" + PathOf(command, " ") + "') commands='" + Joined(commands) + "' options='" +
           Joined(names) + "' valued='" + Joined(valued) + "' ;;\n";
}

}  // namespace

std::string BashCompletion(const CommandDescription& program) {
    std::string table;
    std::string arguments;
    std::map<std::string, std::string> values;  // an option's name, and what completes its value
    VisitAll(program, [&](const CommandDescription& command) {
        table += TableRow(program, command);
        for (const OptionDescription& option : command.options) {
            if (option.takes == Takes::Nothing) {
                continue;
            }
            for (const std::string& name : option.names) {
                const auto [known, isNew] = values.emplace(name, CompletionOf(option));
                if (!isNew && known->second != CompletionOf(option)) {
                    throw std::logic_error(name + " takes one thing here and another there");
                }
            }
        }
        if (!command.arguments.empty()) {
            arguments += "        '" + PathOf(command, " ") + "') " +
                         CompletionOf(command.arguments.front()) + " ;;\n";
        }
    });
    std::string text = "# Completion of " + program.name + " for bash\n\n";
    const std::string function = FunctionName(program);
    text += function + "_table() {\n    case $1 in\n" + table + "    esac\n}\n\n";
    text += function +
            "() {\n"
            "    local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD - 1]}\n"
            "    local command=" +
            program.name +
            " commands options valued word i\n"
            "    COMPREPLY=()\n"
            "    # --option=value comes as three words.\n"
            "    [ \"$current\" != = ] || current=\n"
            "    [ \"$previous\" != = ] || previous=${COMP_WORDS[COMP_CWORD - 2]}\n"
            "    " +
            function +
            "_table \"$command\"\n"
            "    for ((i = 1; i < COMP_CWORD; ++i)); do\n"
            "        word=${COMP_WORDS[i]}\n"
            "        if [[ \" $valued \" == *\" $word \"* ]]; then\n"
            "            i=$((i + 1))\n"
            "        elif [[ \" $commands \" == *\" $word \"* && $command != *' help' ]]; then\n"
            "            command+=\" $word\"\n"
            "            " +
            function +
            "_table \"$command\"\n"
            "        fi\n"
            "    done\n"
            "    case \" $valued \" in *\" $previous \"*)\n"
            "        case $previous in\n";
    for (const auto& [name, completion] : values) {
        text += "        " + name + ") " + completion + " ;;\n";
    }
    text +=
        "        esac\n"
        "        return ;;\n"
        "    esac\n"
        "    if [[ $current == -* ]]; then\n"
        "        COMPREPLY=($(compgen -W \"$options\" -- \"$current\"))\n"
        "        return\n"
        "    fi\n"
        "    case $command in\n" +
        arguments +
        "        *) COMPREPLY=($(compgen -W \"$commands\" -- \"$current\")) ;;\n"
        "    esac\n"
        "}\n\ncomplete -F " +
        function + " " + program.name + "\n";
    return text;
}

}  // namespace Varnholt::Manual
