// What the doctor says on Linux.
#include <gmock/gmock.h>

#include "Platform/Usb/SimulatorAddress.h"
#include "Service/Linux/Diagnosis.h"

namespace Varnholt::Tests {
namespace {

using Service::Failure;
using Service::FailureKind;
using Service::Finding;
using Level = Service::Finding::Level;
using testing::HasSubstr;

Service::DeviceFacts Plugged(const char* kernelDriver = "", bool isRegistered = true) {
    Service::DeviceFacts facts;
    facts.info = {.name = "usb-1p2",
                  .deviceNode = "/dev/bus/usb/001/007",
                  .systemPath = {},
                  .vendorId = "1209",
                  .productId = "0001",
                  .manufacturer = {},
                  .product = "Meter",
                  .serial = {},
                  .kernelDriver = kernelDriver,
                  .registered = isRegistered};
    return facts;
}

const Service::Answer Answers{301, std::nullopt};
const Service::Answer Silence{0, Failure{FailureKind::Timeout, "no answer in time", ""}};

/// What is seen, what opening it gives, and the findings that tell it.
struct Diagnosis {
    const char* name;
    Service::MachineFacts facts;
    std::vector<Level> levels;
    const char* text;  ///< is in the last finding
    const char* fix;   ///< is in its fix; empty: there is none
    std::optional<FailureKind> failure;
    int opened = 0;  ///< instruments that are tried
    Service::Answer answer = Answers;
};

Diagnosis Problem(const char* name, const Service::MachineFacts& facts, const char* text, const char* fix,
                  FailureKind kind) {
    return {name, facts, {Level::Problem}, text, fix, kind};
}

Diagnosis Usable(const char* name, const Service::MachineFacts& facts, const std::vector<Level>& levels) {
    return {name, facts, levels, "answers (firmware 301)", "", std::nullopt, 1};
}

/// A device that its group may use, and the user who may not.
Service::MachineFacts OfGroup(const char* group, const Service::GroupFacts& user) {
    auto device = Plugged();
    device.isAccessible = false;
    device.group = group;
    return {.devices = {device}, .group = user};
}

std::vector<Diagnosis> Diagnoses() {
    auto locked = Plugged();
    locked.isAccessible = false;
    locked.holders = {{42, "python3"}};
    auto held = Plugged();
    held.holders = {{42, "python3"}};
    auto other = Plugged();
    other.hasEndpoints = false;
    const Platform::Usb::SimulatorInfo simulator{"simulated-1", 1000, 9, true, ""};
    auto simulatorInUse = simulator;
    simulatorInUse.usedBy = "ostra (process 8)";
    auto simulatorInKernel = simulator;
    simulatorInKernel.usedBy = Platform::Usb::KernelAsUser;
    auto simulatorOfAnother = simulator;
    simulatorOfAnother.usable = false;
    auto simulatorStopped = simulator;
    simulatorStopped.answers = false;
    const Failure noLock{FailureKind::NoLock, "no lock there", "make room"};
    const std::vector problem{Level::Problem};
    const std::vector good{Level::Good};
    return {
        Problem("nothing", {}, "no USB device", "plug the instrument in", FailureKind::NotFound),
        Problem("not registered", {{Plugged("", false)}, {}}, "usb-1p2 (1209:0001, Meter)",
                "sudo ostra register 1209:0001", FailureKind::NotFound),
        Problem("registered by mistake", {{other}, {}}, "does not have the instrument's endpoints",
                "register --remove 1209:0001", FailureKind::NotFound),
        Problem("no permission", {{locked}, {}}, "no permission on /dev/bus/usb/001/007",
                "log in at this machine's own seat", FailureKind::NoPermission),
        Problem("no permission, no member", OfGroup("plugdev", {"ann"}),
                "members of the group plugdev may use it, and ann is none",
                "group plugdev: sudo usermod -aG plugdev ann, then log in again", FailureKind::NoPermission),
        Problem("no permission, not yet a member", OfGroup("plugdev", {"ann", true, true}),
                "ann is one only from the next login on", "group plugdev: log in again",
                FailureKind::NoPermission),
        Problem("no permission, an older version's rule", OfGroup("root", {"ann", true, true, true}),
                "no permission on /dev/bus/usb/001/007", "group plugdev: sudo ostra register 1209:0001",
                FailureKind::NoPermission),
        Problem("no permission, no such group", OfGroup("", {"ann", false}),
                "no permission on /dev/bus/usb/001/007",
                "sudo groupadd --system plugdev; sudo ostra register 1209:0001; sudo usermod -aG plugdev ann",
                FailureKind::NoPermission),
        Problem("no permission for a member", OfGroup("plugdev", {"ann", true, true, true}),
                "no permission on /dev/bus/usb/001/007", "unplug it and plug it in again",
                FailureKind::NoPermission),
        Problem("no USB", {.hasUsb = false}, "this machine has no USB", "usbipd attach",
                FailureKind::NotFound),
        {"no USB, simulated",
         {.simulators = {simulator}, .hasUsb = false},
         {Level::Good, Level::Note},
         "this machine has no USB",
         "/dev/bus/usb",
         std::nullopt,
         1},
        {"no lock",
         {.devices = {Plugged()}, .missingLock = noLock},
         {Level::Good, Level::Problem},
         "no lock there",
         "make room",
         FailureKind::NoLock,
         1},
        {"no lock where none is needed",
         {.devices = {Plugged()}, .missingLock = noLock, .needsLock = false},
         {Level::Good, Level::Note},
         "no lock there; the transport native needs it",
         "make room",
         std::nullopt,
         1},
        Problem("held", {{held}, {}}, "is in use by python3 (process 42)", "end that program",
                FailureKind::InUse),
        {"silent",
         {{Plugged()}, {}},
         problem,
         "does not answer: no answer in time",
         "its firmware does not run",
         FailureKind::Timeout,
         1,
         Silence},
        Problem("simulated, in use", {{}, {simulatorInUse}}, "is in use by ostra (process 8)",
                "end that program", FailureKind::InUse),
        Problem("simulated, stopped", {{}, {simulatorStopped}}, "simulated-1 does not answer", "kill -CONT 9",
                FailureKind::Timeout),
        {"simulated, another user's",
         {{}, {simulatorOfAnother}},
         {Level::Note, Level::Problem},
         "no USB device",
         "ostra-simulator",
         FailureKind::NotFound},
        {"simulated, plugged into the kernel",
         {{Plugged()}, {simulatorInKernel}},
         {Level::Good, Level::Note},
         "is plugged into the kernel",
         "",
         std::nullopt,
         1},
        Usable("good", {{Plugged()}, {}}, good),
        Usable("a kernel driver", {{Plugged("cdc_acm")}, {}}, {Level::Note, Level::Good}),
        Usable("a program drives it", {{Plugged("usbfs")}, {}}, good),
        Usable("simulated", {{}, {simulator}}, good),
        Usable("one held, one good", {{held, Plugged()}, {}}, {Level::Problem, Level::Good}),
    };
}

TEST(DoctorTest, NamesTheReasonAndTheFix) {
    for (const Diagnosis& row : Diagnoses()) {
        SCOPED_TRACE(row.name);
        int opened = 0;
        const auto findings = Service::Judge(row.facts, [&](const std::string&) {
            ++opened;
            return row.answer;
        });
        std::vector<Level> levels;
        for (const Finding& finding : findings) {
            levels.push_back(finding.level);
        }
        ASSERT_EQ(levels, row.levels);
        EXPECT_EQ(opened, row.opened) << "opening resets an instrument";
        const Finding& last = findings.back();
        EXPECT_THAT(last.subject + " " + last.text, HasSubstr(row.text));
        EXPECT_THAT(last.fix, HasSubstr(row.fix));
        EXPECT_EQ(last.fix.empty(), *row.fix == '\0') << last.fix;
        EXPECT_EQ(last.failure, row.failure);
    }
}

TEST(DoctorTest, TellsOfWhatCannotBeUsed) {
    const auto answers = [](const std::string&) { return Answers; };
    EXPECT_THAT(Service::Judge({{Plugged("cdc_acm")}, {}}, answers).front().text,
                HasSubstr("the kernel driver cdc_acm holds its interface"));
    const auto simulator = Service::Judge({{}, {{"simulated-1", 1000, 9, false, ""}}}, answers).front();
    EXPECT_THAT(simulator.text, HasSubstr("another user (user 1000, process 9)"));
    EXPECT_EQ(simulator.failure, std::nullopt) << "somebody else's simulator is no failure";
}

}  // namespace
}  // namespace Varnholt::Tests
