#include "Service/OpenedInstrument.h"

#include <fmt/format.h>

#include <mutex>
#include <set>

#include "Service/SystemAdvice.h"

namespace Varnholt::Service {
namespace {

std::mutex claimsLock;
std::set<std::string> claims;  // short names, which the transports share; guarded by claimsLock

}  // namespace

OpenedInstrument::Claim::Claim(const std::string& identifier) : name_(ShortNameOf(identifier)) {
    const std::lock_guard held(claimsLock);
    if (!claims.insert(name_).second) {
        throw Failure(FailureKind::InUse, "this process has the instrument open already").Of(identifier);
    }
}

OpenedInstrument::Claim::~Claim() {
    const std::lock_guard held(claimsLock);
    claims.erase(name_);
}

OpenedInstrument::OpenedInstrument(Context& usedContext, const FoundInstrument& found,
                                   DeviceDriver::Generic::EventListener* listener)
    : context_(usedContext), identifier_(found.Identifier()), messageListener_(listener) {
    context_.Told().Opening();
    std::string opened;
    try {
        transport_ =
            Transport::Instance(listener, static_cast<std::uint32_t>(found.index), context_.UsedTransport());
        transport_->RequireWholeData();
        transport_->GetDeviceIdentifier(opened);
        if (opened == identifier_) {
            commands_ = Commands(new CommandSet(transport_));
        }
    } catch (...) {
        context_.Resume();
        context_.UserInterruption().ThrowIfRequested();
        const Failure failure = Describe(std::current_exception());
        const bool isTaken = failure.Kind() == FailureKind::InUse ||
                             failure.Kind() == FailureKind::NoPermission ||
                             failure.Kind() == FailureKind::NoLock;
        if (const std::string holder = isTaken ? HolderOf(identifier_) : ""; !holder.empty()) {
            throw failure.Saying("in use by " + holder)
                .Advising("end that program: an instrument belongs to one process at a time")
                .Of(identifier_);
        }
        throw failure.Of(identifier_);
    }
    if (opened != identifier_) {
        throw Failure(FailureKind::NotFound, "instruments were plugged in or out meanwhile", "try again");
    }
}

OpenedInstrument::~OpenedInstrument() {
    // After an interruption too: closing waits for answers to what it sends.
    context_.Resume();
    try {
        if (messageListener_ != nullptr) {
            transport_->RemoveListener(messageListener_);
        }
    } catch (...) {  // closing takes the listener away as well
    }
}

std::string OpenedInstrument::ChipId() {
    return Do([this](const Commands&) {
        std::array<std::uint8_t, 8> id{};
        transport_->GetChipID(id.data());
        return fmt::format("{:02x}", fmt::join(id, ""));
    });
}

Identity OpenedInstrument::Identify() {
    Identity found{.chipId = ChipId()};
    Do([&found](const Commands& commands) {
        commands->GetMISC(found.misc1, found.misc2, found.misc3, found.misc4, found.misc5);
        auto& mode = found.mode;
        commands->GetMeasureMode(mode[0], mode[1], mode[2], mode[3], mode[4], mode[5]);
        commands->ReadCPLD(found.cpld);
        commands->GetMeasureParameters(found.p1, found.p2, found.p3, found.p4, found.p5);
    });
    return found;
}

void OpenedInstrument::Reset(std::uint16_t code) {
    Do([code](const Commands& commands) { commands->Reset(code); });
}

}  // namespace Varnholt::Service
