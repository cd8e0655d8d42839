#include <fmt/format.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Linux/UdevRule.h"
#include "Output/AtomicFile.h"
#include "Output/Json.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    std::string id;
    std::string file = UdevRuleFile;
    bool remove = false;
    bool dryRun = false;
    bool json = false;
};

std::vector<UsbId> RegisteredIn(const std::string& file) {
    std::ifstream stream(file);
    return IdsInRules({std::istreambuf_iterator<char>(stream), {}});
}

void ChangeRules(const Options& options, const std::vector<UsbId>& ids) {
    if (ids.empty()) {
        std::error_code error;
        std::filesystem::remove(options.file, error);
        if (error) {
            throw ToolFailure(ExitCode::File,
                              fmt::format("{} cannot be removed: {}", options.file, error.message()),
                              "run it as root: sudo ostra register");
        }
        return;
    }
    const std::string text = UdevRules(ids);
    AtomicFile file(options.file);
    file.Stream() << text;
    file.Commit();
}

/// Makes udev read the rules, and look again at what is plugged in.
void ApplyRules(Session& session) {
    const bool applied =
        std::system(
            "udevadm control --reload >/dev/null 2>&1 && "
            "udevadm trigger --action=add --subsystem-match=usb --settle >/dev/null 2>&1") == 0;
    if (!applied) {
        session.Warn("udev did not take the rules at once; unplug the instrument and plug it in again");
    }
}

void Register(Session& session, const Options& options) {
    const UsbId id = ParseUsbId(options.id);
    const std::vector<UsbId> before = RegisteredIn(options.file);
    std::vector<UsbId> after = before;
    std::erase(after, id);
    if (!options.remove) {
        after.push_back(id);
    } else if (after == before) {
        throw ToolFailure(ExitCode::NoInstrument,
                          fmt::format("{} is not registered in {}", options.id, options.file));
    }
    if (options.dryRun) {
        if (options.json) {
            session.Print({{"file", options.file},
                           {"changed", false},
                           {"content", after.empty() ? "" : UdevRules(after)}});
        } else if (after.empty()) {
            session.Out() << "would remove " << options.file << "\n";
        } else {
            session.Out() << "would write " << options.file << ":\n" << UdevRules(after);
        }
        return;
    }
    if (geteuid() != 0 && options.file == UdevRuleFile) {
        throw ToolFailure(
            ExitCode::NotAvailable, fmt::format("only root may write {}", options.file),
            fmt::format("sudo ostra register {}{}", options.remove ? "--remove " : "", options.id));
    }
    std::error_code ignored;
    std::filesystem::create_directories(std::filesystem::path(options.file).parent_path(), ignored);
    ChangeRules(options, after);
    if (options.file == UdevRuleFile) {
        ApplyRules(session);
    }
    if (options.json) {
        session.Print(
            {{"file", options.file}, {"changed", true}, {"content", after.empty() ? "" : UdevRules(after)}});
    } else {
        session.Note(fmt::format("{} is {} ({})", options.id,
                                 options.remove ? "no longer registered" : "registered", options.file));
    }
}

}  // namespace

void AddRegister(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = app.AddCommand(
        "register", "make a kind of USB device known as an instrument (writes a udev rule; as root)");
    command.Add("VID:PID", options->id, "vendor and product number; `ostra list --candidates` shows them")
        .Required();
    command.AddFlag("--remove", options->remove, "take the registration back");
    command.AddFlag("--dry-run", options->dryRun, "show what would be written");
    command.Add("--file", options->file, "the rule file");
    AddJsonFlag(command, options->json);
    SetAction(command, session, options, Register);
}

}  // namespace Varnholt::Cli
