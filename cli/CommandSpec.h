#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace Varnholt::Cli {

/// An option, flag or argument of a command. Each operation answers the option, so that they can be chained.
class OptionSpec final {
  public:
    explicit OptionSpec(CLI::Option* parserOption) : option_(parserOption) {}

    /// What stands for the value in the help.
    OptionSpec& Type(const char* placeholder);
    /// The heading under which the help lists it.
    OptionSpec& Group(const char* heading);
    OptionSpec& Required();
    /// Another option, by its name, that must not be there as well.
    OptionSpec& Excludes(const char* name);
    OptionSpec& Between(double lowest, double highest);
    OptionSpec& OneOf(const std::vector<std::string>& values);
    /// `check` answers what is wrong with a text; empty: nothing.
    OptionSpec& Check(std::function<std::string(const std::string& text)> check);

  private:
    CLI::Option* option_;
};

/// A command, or a group of commands, while the command line is being built: the parser behind it is seen by
/// one source only. Names are as in "-d,--device", or a word for an argument; targets keep their value when
/// the option is not given. A text may not be empty: in a script that is a variable that was never set.
class CommandSpec final {
  public:
    explicit CommandSpec(CLI::App* parserCommand) : command_(parserCommand) {}

    CommandSpec AddCommand(const char* name, const char* about);
    /// A group: one of its commands must be named.
    CommandSpec AddGroup(const char* name, const char* about);

    /// For a `std::string`, a `double`, an unsigned integer of 16 or 32 bits, or several texts or 16-bit
    /// integers.
    template <class Target>
    OptionSpec Add(const char* names, Target& target, const char* about);
    OptionSpec AddFlag(const char* names, bool& target, const char* about);

    /// Text behind the options.
    void Footer(const char* text);
    /// Called when the command is the one that the user asked for.
    void WhenChosen(std::function<void()> call);

  private:
    CLI::App* command_;
};

}  // namespace Varnholt::Cli
