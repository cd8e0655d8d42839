#include <ostream>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Service/Finding.h"
#include "Session.h"

namespace Varnholt::Cli {
namespace {

struct DoctorOptions {
    std::string transport;
    bool json = false;
};

using Service::Finding;

const char* NameOf(Finding::Level level) {
    switch (level) {
        case Finding::Level::Good:
            return "good";
        case Finding::Level::Note:
            return "note";
        case Finding::Level::Problem:
            return "problem";
    }
    return "";
}

void Doctor(Session& session, const DoctorOptions& options) {
    session.ChooseTransport(options.transport);
    const std::vector<Finding> findings = Diagnose(session.Context());
    Json list{Json::Array()};
    std::optional<FailureKind> failure;
    for (const Finding& finding : findings) {
        list.Append({{"level", NameOf(finding.level)},
                     {"subject", finding.subject},
                     {"text", finding.text},
                     {"fix", finding.fix}});
        if (!failure) {
            failure = finding.failure;
        }
        if (!options.json) {
            session.Out() << NameOf(finding.level) << ": " << finding.subject
                          << (finding.subject.empty() ? "" : " ") << finding.text << "\n";
            if (!finding.fix.empty()) {
                session.Out() << "    " << finding.fix << "\n";
            }
        }
    }
    if (options.json) {
        session.Print({{"findings", list}});
    }
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
    command.Add("--transport", options.transport, "native or usbio; without it, as the machine prefers")
        .OneOf({"native", "usbio"});
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
