#include "Service/Linux/Diagnosis.h"

#include <fmt/format.h>
#include <grp.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/WaitableObjects.h"
#include "Service/Instruments.h"
#include "Service/Linux/DeviceHolder.h"
#include "Service/Linux/UdevRule.h"
#include "Service/SystemAdvice.h"

namespace Varnholt::Service {
namespace {

using Level = Finding::Level;
using Platform::Usb::UsbDeviceInfo;

constexpr const char* Replug = "unplug it and plug it in again";
constexpr const char* GiveItUsb =
    "in a container: pass it the host's /dev/bus/usb and /run/udev; in WSL: `usbipd attach` on Windows; in a "
    "virtual machine: add a USB controller; or start ostra-simulator in another terminal";
constexpr const char* EndTheOther = "end that program, or wait until it is done";
/// The kernel's name for programs that drive a device themselves.
constexpr const char* ProgramAsDriver = "usbfs";

std::string NameOf(const UsbDeviceInfo& device) {
    const std::string product = device.product.empty() ? "" : ", " + device.product;
    return fmt::format("{} ({}:{}{})", device.name, device.vendorId, device.productId, product);
}

std::string WhoMayUse(const DeviceFacts& device, const GroupFacts& group) {
    if (device.group != InstrumentGroup || group.isMemberHere) {
        return {};
    }
    return fmt::format(": members of the group {} may use it, and {} {}", InstrumentGroup, group.user,
                       group.isMember ? "is one only from the next login on" : "is none");
}

/// How the user comes to be allowed to use a device.
std::string WayToPermission(const DeviceFacts& device, const GroupFacts& group) {
    std::string steps;
    const auto add = [&steps](const std::string& step) { steps += (steps.empty() ? "" : "; ") + step; };
    if (!group.exists) {
        add(fmt::format("sudo groupadd --system {}", InstrumentGroup));
    }
    if (device.group != InstrumentGroup) {
        add(fmt::format("sudo ostra register {}:{}", device.info.vendorId, device.info.productId));
    }
    if (!group.isMember) {
        add(fmt::format("sudo usermod -aG {} {}, then log in again", InstrumentGroup, group.user));
    } else if (!group.isMemberHere) {
        add(fmt::format("log in again: this session began before {} was a member", group.user));
    }
    if (steps.empty()) {
        return fmt::format("{}; a container must be given the device by whoever starts it", Replug);
    }
    return fmt::format("log in at this machine's own seat, or use it as a member of the group {}: {}",
                       InstrumentGroup, steps);
}

/// The verdict; what else is worth knowing is added to `notes`.
Finding JudgeDevice(const DeviceFacts& facts, const GroupFacts& group, const Trial& trial,
                    std::vector<Finding>& notes) {
    const UsbDeviceInfo& device = facts.info;
    const std::string subject = NameOf(device);
    const std::string id = device.vendorId + ":" + device.productId;
    if (!facts.hasEndpoints) {
        return {Level::Problem, subject, "is registered but does not have the instrument's endpoints",
                "sudo ostra register --remove " + id, FailureKind::NotFound};
    }
    if (!device.registered) {
        return {Level::Problem, subject, "has the instrument's endpoints but is not registered",
                "sudo ostra register " + id, FailureKind::NotFound};
    }
    if (!facts.isAccessible) {
        return {Level::Problem, subject, "no permission on " + device.deviceNode + WhoMayUse(facts, group),
                WayToPermission(facts, group), FailureKind::NoPermission};
    }
    if (!facts.holder.empty()) {
        return {Level::Problem, subject, "is in use by " + facts.holder, EndTheOther, FailureKind::InUse};
    }
    if (!device.kernelDriver.empty() && device.kernelDriver != ProgramAsDriver) {
        notes.push_back(
            {Level::Note, subject,
             fmt::format(
                 "the kernel driver {} holds its interface; it gives way while the instrument is open",
                 device.kernelDriver),
             ""});
    }
    return JudgeAnswer(subject, trial(device.name));
}

Finding JudgeSimulator(const Platform::Usb::SimulatorInfo& simulator, const Trial& trial) {
    if (!simulator.answers) {
        return {simulator.usable ? Level::Problem : Level::Note, simulator.name,
                "does not answer; it may have been stopped",
                simulator.processId == 0 ? "whoever runs it should let it go on, or end it"
                                         : fmt::format("let it go on (kill -CONT {0}), or end it (kill -KILL "
                                                       "{0})",
                                                       simulator.processId),
                FailureKind::Timeout};
    }
    if (!simulator.usable) {
        return {Level::Note, simulator.name,
                fmt::format("is run by another user (user {}, process {}) and cannot be used",
                            simulator.userId, simulator.processId),
                "start an ostra-simulator of your own"};
    }
    if (simulator.usedBy == Platform::Usb::KernelAsUser) {
        return {Level::Note, simulator.name, "is plugged into the kernel, which shows it as a USB device",
                ""};
    }
    if (!simulator.usedBy.empty()) {
        return {Level::Problem, simulator.name, "is in use by " + simulator.usedBy, EndTheOther,
                FailureKind::InUse};
    }
    return JudgeAnswer(simulator.name, trial(simulator.name));
}

std::string UserName() {
    const passwd* const user = getpwuid(geteuid());
    return user == nullptr ? std::to_string(geteuid()) : user->pw_name;
}

GroupFacts LookAtGroup() {
    GroupFacts facts{.user = UserName()};
    const group* const found = getgrnam(InstrumentGroup);
    facts.exists = found != nullptr;
    if (found == nullptr) {
        return facts;
    }
    facts.isMemberHere = getegid() == found->gr_gid || group_member(found->gr_gid) != 0;
    facts.isMember = facts.isMemberHere;
    for (char** member = found->gr_mem; *member != nullptr; ++member) {
        facts.isMember = facts.isMember || facts.user == *member;
    }
    return facts;
}

/// The group whose members may read and write the file; empty: none.
std::string GroupOf(const std::string& file) {
    struct stat state {};
    constexpr mode_t readAndWrite = S_IRGRP | S_IWGRP;
    if (stat(file.c_str(), &state) != 0 || (state.st_mode & readAndWrite) != readAndWrite) {
        return {};
    }
    const group* const owner = getgrgid(state.st_gid);
    return owner == nullptr ? "" : owner->gr_name;
}

/// Makes a lock such as an instrument's in the machine's shared memory, and lets go of it; tells of the
/// failure.
std::optional<Failure> TryLocks() {
    const Platform::OwnedHandle lock(Platform::MakeMutex("doctor"));
    return lock ? std::nullopt : std::optional(DescribeMissingLock(Platform::LastError()));
}

MachineFacts LookAround(const Context& context) {
    MachineFacts facts;
    for (const UsbDeviceInfo& device : Platform::Usb::ListCandidateDevices()) {
        facts.devices.push_back({device, true, access(device.deviceNode.c_str(), R_OK | W_OK) == 0,
                                 GroupOf(device.deviceNode), FindHolder(device.deviceNode)});
    }
    for (const UsbDeviceInfo& device : Platform::Usb::ListRegisteredDevices()) {
        const bool isCandidate = std::ranges::any_of(
            facts.devices, [&](const DeviceFacts& known) { return known.info.name == device.name; });
        if (!isCandidate) {
            facts.devices.push_back({.info = device, .hasEndpoints = false});
        }
    }
    facts.simulators = Platform::Usb::ListSimulators();
    std::error_code ignored;
    facts.hasUsb = std::filesystem::exists("/sys/bus/usb", ignored);
    facts.group = LookAtGroup();
    facts.missingLock = TryLocks();
    facts.needsLock = context.UsedTransport() == Context::Transport::Native;
    return facts;
}

Answer Try(Context& context, const std::string& shortName) {
    const std::vector<std::string> connected = ListInstruments(context);
    const auto listed = std::ranges::find(connected, shortName, &ShortNameOf);
    if (listed == connected.end()) {
        return {.failure = Failure{FailureKind::NotFound, "the library does not list it", Replug}};
    }
    return TryInstrument(context, *listed);
}

}  // namespace

std::vector<Finding> Judge(const MachineFacts& facts, const Trial& trial) {
    std::vector<Finding> findings;
    for (const DeviceFacts& device : facts.devices) {
        const Finding verdict = JudgeDevice(device, facts.group, trial, findings);
        findings.push_back(verdict);
    }
    for (const auto& simulator : facts.simulators) {
        findings.push_back(JudgeSimulator(simulator, trial));
    }
    const bool isAnythingThere =
        std::ranges::any_of(findings, [](const Finding& finding) { return finding.level != Level::Note; });
    if (!facts.hasUsb) {
        findings.push_back({isAnythingThere ? Level::Note : Level::Problem, "",
                            "this machine has no USB (there is no /sys/bus/usb)", GiveItUsb,
                            isAnythingThere ? std::nullopt : std::optional(FailureKind::NotFound)});
    } else if (!isAnythingThere) {
        findings.push_back(
            {Level::Problem, "", "no USB device with the instrument's endpoints is plugged in",
             "plug the instrument in and look at its cable and hub, or start ostra-simulator in another "
             "terminal",
             FailureKind::NotFound});
    }
    if (facts.missingLock) {
        const Failure& missing = *facts.missingLock;
        findings.push_back({facts.needsLock ? Level::Problem : Level::Note, "",
                            missing.Message() + (facts.needsLock ? "" : "; the transport native needs it"),
                            missing.Advice(),
                            facts.needsLock ? std::optional(missing.Kind()) : std::nullopt});
    }
    return findings;
}

std::vector<Finding> Diagnose(Context& context) {
    return Judge(LookAround(context), [&context](const std::string& name) { return Try(context, name); });
}

}  // namespace Varnholt::Service
