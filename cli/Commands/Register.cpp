#include <fmt/format.h>
#include <grp.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Service/Linux/UdevRule.h"
#include "Utilities/Files/AtomicFile.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct RegisterOptions {
    std::string id;
    std::string file = UdevRuleFile;
    bool remove = false;
    bool dryRun = false;
    bool json = false;
};

std::string RulesIn(const std::string& file) {
    std::error_code error;
    const auto status = std::filesystem::status(file, error);
    if (status.type() == std::filesystem::file_type::not_found) {
        return {};
    }
    std::ifstream stream(file);
    if (!std::filesystem::is_regular_file(status) || !stream) {
        throw Failure(FailureKind::File, file + " cannot be read", "give a file of udev rules with --file");
    }
    return {std::istreambuf_iterator<char>(stream), {}};
}

void ChangeRules(const RegisterOptions& options, const std::string& rules) {
    if (rules.empty()) {
        std::error_code error;
        std::filesystem::remove(options.file, error);
        if (error) {
            throw Failure(FailureKind::File,
                          fmt::format("{} cannot be removed: {}", options.file, error.message()),
                          "run it as root: sudo ostra register");
        }
        return;
    }
    Utilities::Files::AtomicFile file(options.file);
    file.Stream() << rules;
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

/// udev passes over a group that it does not know.
void WarnOfMissingGroup(Session& session, const RegisterOptions& options) {
    if (getgrnam(InstrumentGroup) == nullptr) {
        session.Warn(fmt::format(
            "there is no group {0}, so only the user at the seat has access; for others: sudo groupadd "
            "--system {0}, then sudo ostra register {1}",
            InstrumentGroup, options.id));
    }
}

void Register(Session& session, const RegisterOptions& options) {
    const UsbId id = ParseUsbId(options.id);
    const std::string before = RulesIn(options.file);
    const RulesLeft left = WithoutRule(before, id);
    const std::string after = options.remove ? left.rules : WithRule(before, id);
    if (options.remove && !left.changed) {
        throw Failure(FailureKind::NotFound,
                      fmt::format("{} is not registered in {}", options.id, options.file));
    }
    if (options.dryRun) {
        session.Print(options.json, {{"file", options.file}, {"changed", false}, {"content", after}},
                      after.empty() ? fmt::format("would remove {}\n", options.file)
                                    : fmt::format("would write {}:\n{}", options.file, after));
        return;
    }
    if (geteuid() != 0 && options.file == UdevRuleFile) {
        throw Failure(FailureKind::NoPermission, fmt::format("only root may write {}", options.file),
                      fmt::format("sudo ostra register {}{}", options.remove ? "--remove " : "", options.id));
    }
    std::error_code ignored;
    std::filesystem::create_directories(std::filesystem::path(options.file).parent_path(), ignored);
    ChangeRules(options, after);
    if (options.file == UdevRuleFile) {
        ApplyRules(session);
        if (!options.remove) {
            WarnOfMissingGroup(session, options);
        }
    }
    if (options.json) {
        session.Print({{"file", options.file}, {"changed", true}, {"content", after}});
    } else {
        session.Note(fmt::format("{} is {} ({})", options.id,
                                 options.remove
                                     ? "no longer registered; access to what is plugged in ends with "
                                       "its next unplugging"
                                     : "registered",
                                 options.file));
    }
}

}  // namespace

void AddRegister(CommandSpec app, Session& session) {
    auto [command, options] = NewCommand(
        app, session, "register",
        "make a kind of USB device known as an instrument (writes a udev rule; as root)", Register);
    command.Add("VID:PID", options.id, "vendor and product number; `ostra list --candidates` shows them",
                {.isRequired = true});
    command.Add("--remove", options.remove, "take the registration back");
    command.Add("--dry-run", options.dryRun, "show what would be written");
    command.Add("--file", options.file, "the file of udev rules; other rules in it stay");
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
