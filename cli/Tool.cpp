#include "Tool.h"

#include <fmt/format.h>

#include <algorithm>
#include <CLI/CLI.hpp>
#include <set>
#include <sstream>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {
namespace {

constexpr const char* Description = "ostra: the command line of a USB hand-held optical measuring instrument";

constexpr const char* Footer = R"(
`ostra COMMAND --help` tells more of a command.

Exit codes:
    0  success
    1  a failure that none of the others names
    2  the command line cannot be understood
    3  no instrument, not the one that was named, or it was unplugged
    4  the instrument is used by another process, or there is no permission
    5  a transfer failed
    6  the instrument did not answer in time
    7  data or values that cannot be used (an image, a table, an integration time)
    8  a file cannot be read or written
    9  the images that were compared differ
  130  interrupted (Ctrl-C)
)";

/// An argument that is an option as well is described once, and the same help is printed each time: the
/// parser keeps what an option excludes in the order of addresses.
class HelpFormatter final : public CLI::Formatter {
    std::string make_option_opts(const CLI::Option* option) const override {
        std::string text = Formatter::make_option_opts(option);
        const std::string label = " " + get_label("Excludes") + ":";
        const std::size_t at = text.find(label);
        if (at == std::string::npos) {
            return text;
        }
        std::set<std::string> names;
        for (const CLI::Option* const other : option->get_excludes()) {
            names.insert(other->get_name());
        }
        return fmt::format("{}{} {}", text.substr(0, at), label, fmt::join(names, " "));
    }
    std::string make_option(const CLI::Option* option, bool isPositional) const override {
        if (!isPositional || option->get_lnames().empty()) {
            return Formatter::make_option(option, isPositional);
        }
        std::ostringstream out;
        CLI::detail::format_help(out, make_option_name(option, true), "the same as " + option->get_name(),
                                 column_width_);
        return out.str();
    }
};

/// A command, and its name as the user writes it.
struct NamedCommand {
    CLI::App* command;
    std::string name;
};

NamedCommand ChosenCommand(CLI::App& app) {
    NamedCommand chosen{&app, app.get_name()};
    for (auto next = app.get_subcommands(); !next.empty(); next = chosen.command->get_subcommands()) {
        chosen.command = next.front();
        chosen.name += " " + chosen.command->get_name();
    }
    return chosen;
}

std::string AdviceOn(const NamedCommand& command) {
    return "`" + command.name + " --help` tells more";
}

void PrintHelp(CLI::App& app, const std::vector<std::string>& words, Session& session) {
    NamedCommand found{&app, app.get_name()};
    for (const std::string& word : words) {
        const auto fitting = found.command->get_subcommands(
            [&word](CLI::App* command) { return command->get_name() == word; });
        if (fitting.empty()) {
            throw Failure(FailureKind::BadArgument, "`" + found.name + "` has no command '" + word + "'",
                          AdviceOn(found));
        }
        found = {fitting.front(), found.name + " " + word};
    }
    session.Out() << app.get_formatter()->make_help(found.command, found.name, CLI::AppFormatMode::Normal);
}

void AddHelp(CLI::App& app, Session& session) {
    const auto words = std::make_shared<std::vector<std::string>>();
    CommandSpec command = CommandSpec(&app).AddCommand("help", "print the help of a command");
    command.Add("COMMAND", *words, "its name, and for a command of a group the group's before it");
    command.WhenChosen([&app, &session, words] {
        session.action = [&app, &session, words] { PrintHelp(app, *words, session); };
    });
}

/// An option of the instrument that stands before the command counts as if it stood behind it.
void PassOn(CLI::App& app, const char* name) {
    const CLI::Option* const before = app.get_option(name);
    if (before->count() == 0) {
        return;
    }
    const NamedCommand chosen = ChosenCommand(app);
    CLI::Option* const own = chosen.command->get_option_no_throw(name);
    const auto refusal = [&](const std::string& why) {
        return Failure(FailureKind::BadArgument, name + why, AdviceOn(chosen));
    };
    if (own == nullptr) {
        throw refusal(" means nothing to `" + chosen.name + "`");
    }
    if (own->count() > 0 && own->results() != before->results()) {
        throw refusal(" is given twice: " + before->results().front() + " and " + own->results().front());
    }
    for (const CLI::Option* const other : own->get_excludes()) {
        if (other->count() > 0) {
            throw refusal(" excludes " + other->get_name());
        }
    }
    own->clear();
    own->add_result(before->results().front());
    own->run_callback();
}

void BuildCommandLine(CLI::App& app, InstrumentOptions& instrument, Session& session) {
    app.formatter(std::make_shared<HelpFormatter>());
    app.require_subcommand(1);
    app.fallthrough();  // what stands before the command may stand behind it as well
    app.set_version_flag("--version", "ostra " OSTRA_VERSION, "print the version");
    app.set_help_flag("-h,--help", "print this help");
    CommandSpec tool(&app);
    tool.Add("--capture", session.captureFile,
             "record the USB traffic in a pcapng file, made when an instrument is opened", {.type = "FILE"});
    tool.Add("-v,--verbose", session.verbose,
             "tell on standard error what is sent to the instrument and comes from it");
    AddInstrumentOptions(tool, instrument);
    // In the order in which the help lists them.
    for (const auto add : {AddList, AddReadout, AddScan, AddIdentify, AddReset, AddMonitor, AddWriteImage,
                           AddEeprom, AddCalibration, AddLog, AddRam, AddBinary, AddWord}) {
        add(tool, session);
    }
    AddSystemCommands(tool, session);
    AddHelp(app, session);
    app.footer(Footer);  // after the commands, which would inherit it
}

/// What is wrong with a command line, and whose help tells more.
Failure ReportOf(CLI::App& app, const CLI::ParseError& error) {
    const NamedCommand chosen = ChosenCommand(app);
    std::string message = error.what();
    if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::ExtrasError)) {
        message = "not expected here:";  // the parser's own text has them backwards
        for (const std::string& extra : app.remaining(true)) {
            message += " " + extra;
        }
    }
    if (!chosen.command->get_subcommands({}).empty()) {
        // The parser only misses a command where there is one that it does not know, and leaves that to the
        // tool itself.
        const std::vector<std::string> unknown = app.remaining();
        const auto word =
            std::ranges::find_if(unknown, [](const std::string& text) { return !text.starts_with('-'); });
        message = word == unknown.end() ? "a command is missing behind `" + chosen.name + "`"
                                        : "`" + chosen.name + "` has no command '" + *word + "'";
    }
    return {FailureKind::BadArgument, message, AdviceOn(chosen)};
}

ExitCode Run(std::vector<std::string> arguments, Streams& streams, Session& session) {
    CLI::App app(Description, "ostra");
    InstrumentOptions instrument;
    BuildCommandLine(app, instrument, session);
    if (arguments.empty()) {
        streams.err << app.help();
        return ExitCode::Usage;
    }
    try {
        std::reverse(arguments.begin(), arguments.end());  // the parser wants the last one first
        app.parse(arguments);
        PassOn(app, "--device");
        PassOn(app, "--transport");
    } catch (const CLI::ParseError& error) {
        const bool isHelp = error.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success);
        if (isHelp) {
            app.exit(error, streams.out, streams.err);
            session.FlushOut();
            return ExitCode::Success;
        }
        session.Report(ReportOf(app, error));
        return ExitCode::Usage;
    }
    session.CarryOut();
    return ExitCode::Success;
}

}  // namespace

ExitCode RunTool(const std::vector<std::string>& arguments, Streams& streams,
                 Service::Interruption& interruption) {
    Session session(streams, interruption);
    try {
        return Run(arguments, streams, session);
    } catch (...) {
        const Failure failure = session.Explain(std::current_exception());
        session.Report(failure);
        return ExitCodeOf(failure.Kind());
    }
}

void ShowCommandLine(const std::function<void(CLI::App& tool)>& look) {
    std::ostringstream unused;
    Streams streams{unused, unused, unused, {}, {}};
    Service::Interruption interruption;
    Session session(streams, interruption);
    CLI::App app(Description, "ostra");
    InstrumentOptions instrument;
    BuildCommandLine(app, instrument, session);
    look(app);
}

}  // namespace Varnholt::Cli
