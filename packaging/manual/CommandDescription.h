#pragma once

#include <string>
#include <vector>

namespace Varnholt::Manual {

/// What can stand behind an option, or as an argument, as a shell can complete it.
enum class Takes { Nothing, Text, File, Instrument, Candidate, OneOf, CommandName };

/// An option, flag or argument, as the help describes it.
struct OptionDescription {
    std::vector<std::string> names;  ///< such as "-d" and "--device"; of an argument, its name alone
    std::string placeholder;         ///< what stands for the value; empty for flags
    std::string about;
    std::string heading;  ///< under which the help lists it
    std::string byDefault;
    Takes takes = Takes::Nothing;
    std::vector<std::string> values;    ///< of `Takes::OneOf`
    std::vector<std::string> excludes;  ///< names of options that cannot stand beside it
    std::vector<std::string> needs;
    bool isRequired = false;
    bool isRepeated = false;
    bool isValueOptional = false;
};

/// A program, one of its commands, or a group of them.
struct CommandDescription {
    std::string name;
    std::vector<std::string> path;  ///< from the program's name to its own
    std::string about;
    std::string footer;
    std::vector<OptionDescription> options;
    std::vector<OptionDescription> arguments;
    std::vector<CommandDescription> commands;
};

}  // namespace Varnholt::Manual
