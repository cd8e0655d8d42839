// What the doctor says on Linux.
#include "ExpectFindings.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Service/Linux/Diagnosis.h"
#include "Service/SystemAdvice.h"

namespace Varnholt::Tests {
namespace {

using namespace Service;

Service::DeviceFacts Plugged(const char* kernelDriver = "", bool isRegistered = true) {
    Service::DeviceFacts facts;
    facts.info.name = "usb-1p2";
    facts.info.deviceNode = "/dev/bus/usb/001/007";
    facts.info.vendorId = "1209";
    facts.info.productId = "0001";
    facts.info.product = "Meter";
    facts.info.kernelDriver = kernelDriver;
    facts.info.registered = isRegistered;
    return facts;
}

MachineFacts With(const Service::DeviceFacts& device) {
    return {.devices = {device}};
}

/// A device that its group may use, and the user who may not.
MachineFacts OfGroup(const char* group, const Service::GroupFacts& user) {
    auto device = Plugged();
    device.isAccessible = false;
    device.group = group;
    return {.devices = {device}, .group = user};
}

MachineFacts Simulated(const char* usedBy, bool isUsable = true, bool answers = true) {
    return {.simulators = {{"simulated-1", 1000, 9, isUsable, usedBy, answers}}};
}

/// What is seen, what opening it gives, and the findings that tell it.
struct Diagnosis {
    const char* name;
    MachineFacts facts;
    std::string levels;
    const char* text;
    const char* fix = "";
    std::optional<FailureKind> failure{};
    int opened = 0;  ///< instruments that are tried
};

TEST(DoctorTest, NamesTheReasonAndTheFix) {
    constexpr auto NotFound = FailureKind::NotFound, NoPermission = FailureKind::NoPermission;
    constexpr std::optional<FailureKind> none;
    constexpr const char* answers = "answers (firmware 301)";
    constexpr const char* locked = "no permission on /dev/bus/usb/001/007";
    auto held = Plugged();
    held.holder = "python3 (process 42)";
    auto lockedAndHeld = held;
    lockedAndHeld.isAccessible = false;
    auto other = Plugged();
    other.hasEndpoints = false;
    const Failure noLock{FailureKind::NoLock, "no lock there", "make room"};
    MachineFacts ofNobody = Simulated("", true, false);
    ofNobody.simulators[0].processId = 0;
    MachineFacts inKernel = Simulated(Platform::Usb::KernelAsUser);
    inKernel.devices = {Plugged()};
    MachineFacts withoutUsb = Simulated("");
    withoutUsb.hasUsb = false;
    MachineFacts withoutLock = With(Plugged());
    withoutLock.missingLock = noLock;
    MachineFacts needsNoLock = withoutLock;
    needsNoLock.needsLock = false;
    for (const Diagnosis& row : {
             Diagnosis{"nothing", {}, "p", "no USB device", "plug the instrument in", NotFound},
             {"not registered", With(Plugged("", false)), "p", "usb-1p2 (1209:0001, Meter)",
              "sudo ostra register 1209:0001", NotFound},
             {"no instrument", With(other), "p", "does not have the instrument's endpoints",
              "register --remove 1209:0001", NotFound},
             {"no permission", With(lockedAndHeld), "p", locked, "log in at this machine's own seat",
              NoPermission},
             {"no member", OfGroup("plugdev", {"ann"}), "p",
              "members of the group plugdev may use it, and ann is none",
              "group plugdev: sudo usermod -aG plugdev ann, then log in again", NoPermission},
             {"not yet a member", OfGroup("plugdev", {"ann", true, true}), "p",
              "ann is one only from the next login on", "group plugdev: log in again", NoPermission},
             {"an older version's rule", OfGroup("root", {"ann", true, true, true}), "p", locked,
              "group plugdev: sudo ostra register 1209:0001", NoPermission},
             {"no such group", OfGroup("", {"ann", false}), "p", locked,
              "sudo groupadd --system plugdev; sudo ostra register 1209:0001; sudo usermod -aG plugdev ann",
              NoPermission},
             {"a member", OfGroup("plugdev", {"ann", true, true, true}), "p", locked,
              "unplug it and plug it in again", NoPermission},
             {"no USB", {.hasUsb = false}, "p", "this machine has no USB", "usbipd attach", NotFound},
             {"no USB, simulated", withoutUsb, "gn", "this machine has no USB", "/dev/bus/usb", {}, 1},
             {"no lock", withoutLock, "gp", "no lock there", "make room", FailureKind::NoLock, 1},
             {"no lock needed", needsNoLock, "gn", "no lock there; the transport native needs it",
              "make room", none, 1},
             {"held", With(held), "p", "is in use by python3 (process 42)", "end that program",
              FailureKind::InUse},
             {"silent", With(Plugged("silent")), "np", "does not answer: no answer in time",
              "its firmware does not run", FailureKind::Timeout, 1},
             {"simulated, in use", Simulated("ostra (process 8)"), "p", "is in use by ostra (process 8)",
              "end that program", FailureKind::InUse},
             {"simulated, stopped", Simulated("", true, false), "p", "simulated-1 does not answer",
              "kill -CONT 9", FailureKind::Timeout},
             {"simulated, stopped by nobody known", ofNobody, "p", "simulated-1 does not answer",
              "whoever runs it should let it go on", FailureKind::Timeout},
             {"simulated, another user's", Simulated("", false), "np", "another user (user 1000, process 9)",
              "ostra-simulator", NotFound},
             {"simulated, plugged into the kernel", inKernel, "gn", "is plugged into the kernel", "", {}, 1},
             {"good", With(Plugged()), "g", answers, "", {}, 1},
             {"a kernel driver", With(Plugged("cdc_acm")), "ng", "kernel driver cdc_acm holds its", "", none,
              1},
             {"a program drives it", With(Plugged("usbfs")), "g", answers, "", {}, 1},
             {"simulated", Simulated(""), "g", answers, "", {}, 1},
             {"one held, one good", {{held, Plugged()}}, "pg", answers, "", {}, 1},
         }) {
        SCOPED_TRACE(row.name);
        const bool isSilent = row.failure == FailureKind::Timeout;
        int opened = 0;
        const auto open = [&](const std::string&) -> Service::Answer {
            ++opened;
            return isSilent ? Service::Answer{0, Failure{FailureKind::Timeout, "no answer in time", ""}}
                            : Service::Answer{301, std::nullopt};
        };
        ExpectFindings(Service::Judge(row.facts, open), row.levels, row.text, row.fix, row.failure);
        EXPECT_EQ(opened, row.opened) << "opening resets an instrument";
    }
}

TEST(DoctorTest, TellsWhyThereIsNoLock) {
    using namespace Platform::Errors;
    for (const auto& [code, reason, advice] :
         {std::tuple(AccessDenied, std::string("it may not be written"), "sudo chmod 1777 /dev/shm"),
          {InvalidHandle, Platform::ErrorText(InvalidHandle),
           "sudo mkdir -p /dev/shm && sudo mount -t tmpfs -o mode=1777 tmpfs /dev/shm;"}}) {
        const Failure failure = DescribeMissingLock(code);
        EXPECT_EQ(failure.Message(), "the lock that instruments need cannot be had in /dev/shm: " + reason);
        EXPECT_THAT(failure.Advice(), testing::StartsWith(advice));
    }
}

}  // namespace
}  // namespace Varnholt::Tests
