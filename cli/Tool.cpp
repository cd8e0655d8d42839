#include "Tool.h"

#include <algorithm>
#include <CLI/CLI.hpp>
#include <ostream>

#include "Commands/Commands.h"
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

void BuildCommandLine(CLI::App& app, Session& session) {
    app.require_subcommand(1);
    app.fallthrough();  // what stands before the command may stand behind it as well
    app.set_version_flag("--version", "ostra " OSTRA_VERSION, "print the version");
    app.set_help_flag("-h,--help", "print this help");
    CommandSpec tool(&app);
    tool.Add("--capture", session.captureFile,
             "record the USB traffic in a pcapng file, made when an instrument is opened")
        .Type("FILE");
    for (const AddCommand add : Commands) {
        add(tool, session);
    }
    AddSystemCommands(tool, session);
    app.footer(Footer);  // after the commands, which would inherit it
}

/// What is wrong with a command line, and whose help tells more.
FailureReport ReportOf(const CLI::App& app, const CLI::ParseError& error) {
    const CLI::App* command = &app;
    std::string name = app.get_name();
    for (auto chosen = command->get_subcommands(); !chosen.empty(); chosen = command->get_subcommands()) {
        command = chosen.front();
        name += " " + command->get_name();
    }
    std::string message = error.what();
    if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::ExtrasError)) {
        message = "not expected here:";  // the parser's own text has them backwards
        for (const std::string& extra : app.remaining(true)) {
            message += " " + extra;
        }
    }
    if (!command->get_subcommands({}).empty()) {
        // The parser only misses a command where there is one that it does not know, and leaves that to the
        // tool itself.
        const std::vector<std::string> unknown = app.remaining();
        const auto word =
            std::ranges::find_if(unknown, [](const std::string& text) { return !text.starts_with('-'); });
        message = word == unknown.end() ? "a command is missing behind `" + name + "`"
                                        : "`" + name + "` has no command '" + *word + "'";
    }
    return {ExitCode::Usage, message, "`" + name + " --help` tells more"};
}

ExitCode Run(std::vector<std::string> arguments, Surroundings& surroundings, Session& session) {
    CLI::App app(Description, "ostra");
    BuildCommandLine(app, session);
    if (arguments.empty()) {
        surroundings.err << app.help();
        return ExitCode::Usage;
    }
    try {
        std::reverse(arguments.begin(), arguments.end());  // the parser wants the last one first
        app.parse(arguments);
    } catch (const CLI::ParseError& error) {
        const bool isHelp = error.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success);
        if (isHelp) {
            app.exit(error, surroundings.out, surroundings.err);
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

ExitCode RunTool(const std::vector<std::string>& arguments, Surroundings& surroundings,
                 Interruption& interruption) {
    Session session(surroundings, interruption);
    try {
        return Run(arguments, surroundings, session);
    } catch (...) {
        const FailureReport report = session.Explain(std::current_exception());
        session.Report(report);
        return report.code;
    }
}

}  // namespace Varnholt::Cli
