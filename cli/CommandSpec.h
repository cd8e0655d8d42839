#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace Varnholt::Cli {

/// What an option, flag or argument may have beside its names, its target and its text.
struct OptionTraits {
    struct Range {
        double lowest, highest;
    };

    const char* type = nullptr;  ///< stands for the value in the help
    bool isRequired = false;
    std::vector<const char*> excludes{};  ///< other options, by name, that must not be there as well
    std::optional<Range> between{};
    std::vector<std::string> oneOf{};
    /// Answers what is wrong with a text; empty: nothing.
    std::string (*check)(const std::string& text) = nullptr;
};

/// A command, or a group of commands, while the command line is being built: the parser behind it is seen by
/// one source only. Names are as in "-d,--device", or a word for an argument; targets keep their value when
/// the option is not given. A text may not be empty: in a script that is a variable that was never set.
class CommandSpec final {
  public:
    explicit CommandSpec(CLI::App* parserCommand, const char* optionsHeading = nullptr)
        : command_(parserCommand), heading_(optionsHeading) {}

    CommandSpec AddCommand(const char* name, const char* about);
    /// A group: one of its commands must be named.
    CommandSpec AddGroup(const char* name, const char* about);

    /// The same command, for options that the help lists under this heading.
    CommandSpec Under(const char* heading) const { return CommandSpec(command_, heading); }
    /// For a `bool`, which makes it a flag, a `std::string`, a `double`, an unsigned integer of 16 or 32
    /// bits, or several texts or 16-bit integers.
    template <class Target>
    void Add(const char* names, Target& target, const char* about, const OptionTraits& traits = {});

    /// Text behind the options.
    void Footer(const char* text);
    /// Called when the command is the one that the user asked for.
    void WhenChosen(std::function<void()> call);

  private:
    CLI::App* command_;
    const char* heading_;
};

}  // namespace Varnholt::Cli
