#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Service/Finding.h"

namespace Varnholt::Cli {
namespace {

using Service::Finding;

const char* NameOf(Finding::Level level) {
    static constexpr const char* names[] = {"good", "note", "problem"};
    return names[static_cast<std::size_t>(level)];
}

void Doctor(Session& session, const InstrumentOptions& options) {
    session.ChooseTransport(options.transport);
    Json list = Json::Array();
    std::string text;
    std::optional<FailureKind> failure;
    for (const Finding& finding : Diagnose(session.Context())) {
        list.Append({{"level", NameOf(finding.level)},
                     {"subject", finding.subject},
                     {"text", finding.text},
                     {"fix", finding.fix}});
        text += fmt::format("{}: {}{}{}\n", NameOf(finding.level), finding.subject,
                            finding.subject.empty() ? "" : " ", finding.text);
        if (!finding.fix.empty()) {
            text += fmt::format("    {}\n", finding.fix);
        }
        if (!failure) {
            failure = finding.failure;
        }
    }
    session.Print(options.json, {{"findings", list}}, text);
    if (failure) {
        throw Failure(*failure, "an instrument cannot be used; see above");
    }
}

}  // namespace

void AddDoctor(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "doctor",
                   "say why an instrument is not found or cannot be used, and what to do", Doctor);
    command.Footer("Every instrument that is free is opened, and thereby reset, to see whether it answers.");
    command.Add("--transport", options.transport, "native or usbio; without it, as the machine prefers",
                {.oneOf = {"native", "usbio"}});
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
