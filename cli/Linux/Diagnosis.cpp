#include "Linux/Diagnosis.h"

#include <fmt/format.h>
#include <unistd.h>

#include <algorithm>

#include "Instrument.h"
#include "Platform/Usb/SimulatorAddress.h"

namespace Varnholt::Cli {
namespace {

using Level = Finding::Level;
using Platform::Usb::UsbDeviceInfo;

constexpr const char* Replug = "unplug it and plug it in again";
constexpr const char* EndTheOther = "end that program, or wait until it is done";
/// The kernel's name for programs that drive a device themselves.
constexpr const char* ProgramAsDriver = "usbfs";

std::string NameOf(const UsbDeviceInfo& device) {
    const std::string product = device.product.empty() ? "" : ", " + device.product;
    return fmt::format("{} ({}:{}{})", device.name, device.vendorId, device.productId, product);
}

Finding JudgeAnswer(const std::string& subject, const Answer& answer) {
    if (!answer.failure) {
        return {Level::Good, subject, fmt::format("answers (firmware {})", answer.firmware), ""};
    }
    const FailureReport& failure = *answer.failure;
    return {Level::Problem, subject, "does not answer: " + failure.message,
            failure.advice.empty()
                ? std::string(Replug) + "; if that does not help, its firmware does not run"
                : failure.advice,
            failure.code};
}

void JudgeDevice(const DeviceFacts& facts, const Trial& trial, std::vector<Finding>& findings) {
    const UsbDeviceInfo& device = facts.info;
    const std::string subject = NameOf(device);
    const std::string id = device.vendorId + ":" + device.productId;
    if (!facts.hasEndpoints) {
        findings.push_back({Level::Problem, subject,
                            "is registered but does not have the instrument's endpoints",
                            "sudo ostra register --remove " + id, ExitCode::NoInstrument});
        return;
    }
    if (!device.registered) {
        findings.push_back({Level::Problem, subject, "has the instrument's endpoints but is not registered",
                            "sudo ostra register " + id, ExitCode::NoInstrument});
        return;
    }
    if (!facts.isAccessible) {
        findings.push_back(
            {Level::Problem, subject, "no permission on " + device.deviceNode,
             fmt::format(
                 "log in at this machine's own seat, or run as root; `sudo ostra register {}` applies "
                 "the rule anew, then {}",
                 id, Replug),
             ExitCode::NotAvailable});
        return;
    }
    if (!facts.holders.empty()) {
        findings.push_back({Level::Problem, subject,
                            fmt::format("is in use by {} (process {})", facts.holders.front().name,
                                        facts.holders.front().processId),
                            EndTheOther, ExitCode::NotAvailable});
        return;
    }
    if (!device.kernelDriver.empty() && device.kernelDriver != ProgramAsDriver) {
        findings.push_back(
            {Level::Note, subject,
             fmt::format(
                 "the kernel driver {} holds its interface; it gives way while the instrument is open",
                 device.kernelDriver),
             ""});
    }
    findings.push_back(JudgeAnswer(subject, trial(device.name)));
}

Finding JudgeSimulator(const Platform::Usb::SimulatorInfo& simulator, const Trial& trial) {
    if (!simulator.answers) {
        return {simulator.usable ? Level::Problem : Level::Note, simulator.name,
                "does not answer; it may have been stopped",
                simulator.processId == 0 ? "whoever runs it should let it go on, or end it"
                                         : fmt::format("let it go on (kill -CONT {0}), or end it (kill -KILL "
                                                       "{0})",
                                                       simulator.processId),
                ExitCode::Timeout};
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
                ExitCode::NotAvailable};
    }
    return JudgeAnswer(simulator.name, trial(simulator.name));
}

MachineFacts LookAround() {
    MachineFacts facts;
    for (const UsbDeviceInfo& device : Platform::Usb::ListCandidateDevices()) {
        facts.devices.push_back({device, true, access(device.deviceNode.c_str(), R_OK | W_OK) == 0,
                                 Platform::Usb::FindHolders(device.deviceNode)});
    }
    for (const UsbDeviceInfo& device : Platform::Usb::ListRegisteredDevices()) {
        const bool isCandidate = std::ranges::any_of(
            facts.devices, [&](const DeviceFacts& known) { return known.info.name == device.name; });
        if (!isCandidate) {
            facts.devices.push_back({device, false, true, {}});
        }
    }
    facts.simulators = Platform::Usb::ListSimulators();
    return facts;
}

Answer Try(Session& session, const std::string& shortName) {
    const std::vector<std::string> connected = ConnectedInstruments();
    const auto listed = std::ranges::find(connected, shortName, &ShortNameOf);
    if (listed == connected.end()) {
        return {0, FailureReport{ExitCode::NoInstrument, "the library does not list it", Replug}};
    }
    try {
        Instrument instrument(session, {*listed, ""});
        std::uint8_t m1 = 0, m3 = 0;
        std::uint16_t m2 = 0, m4 = 0, m5 = 0;
        instrument.Commands().GetMISC(m1, m2, m3, m4, m5);
        return {m2, std::nullopt};
    } catch (...) {
        FailureReport failure = session.Explain(std::current_exception());
        if (failure.message.starts_with(*listed + ": ")) {
            failure.message.erase(0, listed->size() + 2);  // a finding begins with its subject
        }
        return {0, failure};
    }
}

}  // namespace

std::vector<Finding> Judge(const MachineFacts& facts, const Trial& trial) {
    std::vector<Finding> findings;
    for (const DeviceFacts& device : facts.devices) {
        JudgeDevice(device, trial, findings);
    }
    for (const auto& simulator : facts.simulators) {
        findings.push_back(JudgeSimulator(simulator, trial));
    }
    if (std::ranges::none_of(findings, [](const Finding& finding) { return finding.level != Level::Note; })) {
        findings.push_back(
            {Level::Problem, "", "no USB device with the instrument's endpoints is plugged in",
             "plug the instrument in and look at its cable and hub, or start ostra-simulator in another "
             "terminal",
             ExitCode::NoInstrument});
    }
    return findings;
}

std::vector<Finding> Diagnose(Session& session) {
    return Judge(LookAround(), [&session](const std::string& name) { return Try(session, name); });
}

}  // namespace Varnholt::Cli
