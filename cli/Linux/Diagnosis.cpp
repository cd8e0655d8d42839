#include "Linux/Diagnosis.h"

#include <fmt/format.h>
#include <unistd.h>

#include <algorithm>

#include "Failure.h"
#include "Instrument.h"
#include "Platform/Usb/DeviceHolders.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UdevBus.h"

namespace Varnholt::Cli {
namespace {

using Level = Finding::Level;
using Platform::Usb::UsbDeviceInfo;

std::string NameOf(const UsbDeviceInfo& device) {
    const std::string product = device.product.empty() ? "" : ", " + device.product;
    return fmt::format("{} ({}:{}{})", device.name, device.vendorId, device.productId, product);
}

/// Opens the instrument and asks it something.
Finding Try(Session& session, const std::string& subject, const std::string& shortName) {
    const std::vector<std::string> connected = ConnectedInstruments();
    const auto listed = std::ranges::find(connected, shortName, &ShortNameOf);
    if (listed == connected.end()) {
        return {Level::Problem, subject, "is not listed by the library", "unplug it and plug it in again",
                ExitCode::NoInstrument};
    }
    try {
        Instrument instrument(session, {*listed, ""});
        std::uint8_t m1 = 0, m3 = 0;
        std::uint16_t m2 = 0, m4 = 0, m5 = 0;
        instrument.Commands().GetMISC(m1, m2, m3, m4, m5);
        return {Level::Good, subject, fmt::format("answers (firmware {})", m2), ""};
    } catch (...) {
        const FailureReport report = session.Explain(std::current_exception());
        return {Level::Problem, subject, "does not answer: " + report.message,
                report.advice.empty()
                    ? "unplug it and plug it in again; if that does not help, its firmware does not run"
                    : report.advice,
                report.code};
    }
}

void LookAtDevice(Session& session, const UsbDeviceInfo& device, std::vector<Finding>& findings) {
    const std::string subject = NameOf(device);
    if (!device.registered) {
        findings.push_back({Level::Problem, subject, "has the instrument's endpoints but is not registered",
                            fmt::format("sudo ostra register {}:{}", device.vendorId, device.productId),
                            ExitCode::NoInstrument});
        return;
    }
    if (access(device.deviceNode.c_str(), R_OK | W_OK) != 0) {
        findings.push_back(
            {Level::Problem, subject, fmt::format("no permission on {}", device.deviceNode),
             fmt::format(
                 "log in at this machine's own seat, or run as root; `sudo ostra register {}:{}` writes the "
                 "rule anew, then unplug it and plug it in again",
                 device.vendorId, device.productId),
             ExitCode::NotAvailable});
        return;
    }
    const auto holders = Platform::Usb::FindHolders(device.deviceNode);
    if (!holders.empty()) {
        findings.push_back(
            {Level::Problem, subject,
             fmt::format("is in use by {} (process {})", holders.front().name, holders.front().processId),
             "end that program, or wait until it is done", ExitCode::NotAvailable});
        return;
    }
    if (!device.kernelDriver.empty() && device.kernelDriver != "usbfs") {
        findings.push_back(
            {Level::Note, subject,
             fmt::format(
                 "the kernel driver {} holds its interface; it gives way while the instrument is open",
                 device.kernelDriver),
             ""});
    }
    findings.push_back(Try(session, subject, device.name));
}

void LookAtSimulator(Session& session, const Platform::Usb::SimulatorInfo& simulator,
                     std::vector<Finding>& findings) {
    if (!simulator.usable) {
        findings.push_back({Level::Note, simulator.name,
                            fmt::format("is run by another user (user {}, process {}) and cannot be used",
                                        simulator.userId, simulator.processId),
                            "start an ostra-simulator of your own"});
    } else if (!simulator.usedBy.empty()) {
        findings.push_back({Level::Problem, simulator.name, "is in use by " + simulator.usedBy,
                            "end that program, or wait until it is done", ExitCode::NotAvailable});
    } else {
        findings.push_back(Try(session, simulator.name, simulator.name));
    }
}

}  // namespace

std::vector<Finding> Diagnose(Session& session) {
    std::vector<Finding> findings;
    std::vector<UsbDeviceInfo> devices = Platform::Usb::ListCandidateDevices();
    for (const UsbDeviceInfo& registered : Platform::Usb::ListRegisteredDevices()) {
        const bool known =
            std::ranges::any_of(devices, [&](const UsbDeviceInfo& d) { return d.name == registered.name; });
        if (!known) {
            findings.push_back(
                {Level::Problem, NameOf(registered),
                 "is registered but does not have the instrument's endpoints",
                 fmt::format("sudo ostra register --remove {}:{}", registered.vendorId, registered.productId),
                 ExitCode::NoInstrument});
        }
    }
    for (const UsbDeviceInfo& device : devices) {
        LookAtDevice(session, device, findings);
    }
    for (const auto& simulator : Platform::Usb::ListSimulators()) {
        LookAtSimulator(session, simulator, findings);
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

}  // namespace Varnholt::Cli
