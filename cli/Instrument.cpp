#include "Instrument.h"

#include <algorithm>
#include <array>
#include <string_view>

#include "ChipId.h"
#include "DeviceDriver/Ostra/USB/USBBrowser.h"
#include "Holder.h"
#include "Output/Json.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {
namespace {

using DeviceDriver::Ostra::USB::USBBrowser;
using Utilities::Tools::SmartPointer;

std::string Joined(const std::vector<std::string>& names) {
    std::string text;
    for (const std::string& name : names) {
        text += (text.empty() ? "" : ", ") + name;
    }
    return text;
}

}  // namespace

std::vector<std::string> ConnectedInstruments(DeviceDriver::Ostra::Transport transport) {
    const auto paths = USBBrowser::Instance(transport)->GetDevices(0);
    return {paths.begin(), paths.end()};
}

bool IsConnected(const std::string& identifier, DeviceDriver::Ostra::Transport transport) {
    try {
        const auto connected = ConnectedInstruments(transport);
        return std::find(connected.begin(), connected.end(), identifier) != connected.end();
    } catch (...) {  // who asks is already reporting a failure
        return true;
    }
}

std::string ShortNameOf(const std::string& identifier) {
    // Windows: \\?\usb#vid_1234&pid_5678#NAME#{interface class}
    if (identifier.starts_with("\\\\")) {
        const std::size_t end = identifier.rfind('#');
        const std::size_t begin = end == 0 || end == std::string::npos ? end : identifier.rfind('#', end - 1);
        return begin == std::string::npos ? identifier : identifier.substr(begin + 1, end - begin - 1);
    }
    return identifier.substr(identifier.rfind('/') + 1);
}

std::size_t FindInstrument(const std::vector<std::string>& identifiers, const std::string& name) {
    if (identifiers.empty()) {
        throw ToolFailure(ExitCode::NoInstrument, "no instrument is connected", SystemAdvice::NoneIsFound);
    }
    if (name.empty()) {
        return 0;
    }
    using Fits = bool (*)(const std::string& identifier, const std::string& name);
    constexpr Fits ways[]{
        [](const std::string& identifier, const std::string& wanted) { return identifier == wanted; },
        [](const std::string& identifier, const std::string& wanted) {
            return ShortNameOf(identifier) == wanted;
        },
        [](const std::string& identifier, const std::string& wanted) {
            return identifier.ends_with(wanted) || ShortNameOf(identifier).ends_with(wanted);
        },
    };
    for (const Fits fits : ways) {
        std::vector<std::string> found;
        for (const std::string& identifier : identifiers) {
            if (fits(identifier, name)) {
                found.push_back(identifier);
            }
        }
        if (found.size() > 1) {
            throw ToolFailure(ExitCode::NoInstrument, "'" + name + "' fits several instruments",
                              "name one of them: " + Joined(found));
        }
        if (found.size() == 1) {
            return static_cast<std::size_t>(std::find(identifiers.begin(), identifiers.end(), found.front()) -
                                            identifiers.begin());
        }
    }
    throw ToolFailure(ExitCode::NoInstrument, "no instrument '" + name + "' is connected",
                      "connected: " + Joined(identifiers));
}

Instrument::Instrument(Session& usedSession, const InstrumentOptions& options, Choice choice,
                       DeviceDriver::Generic::EventListener* listener)
    : session_(usedSession), messageListener_(listener) {
    session_.ChooseTransport(options.transport);
    const std::vector<std::string> connected = ConnectedInstruments(session_.UsedTransport());
    const bool byChip = NamesChip(options.device) && !connected.empty();
    const std::size_t index =
        FindInstrument(connected, byChip ? FindByChipId(session_, connected, options) : options.device);
    identifier_ = connected[index];
    if (options.device.empty() && connected.size() > 1) {
        if (choice == Choice::MustBeNamed) {
            throw ToolFailure(ExitCode::Usage, "several instruments are connected",
                              "say which one with --device: " + Joined(connected));
        }
        session_.Note("taking " + identifier_ + ", the first of " + std::to_string(connected.size()) +
                      " (--device names another)");
    }
    session_.BeginRecording();
    std::string opened;
    try {
        transport_ =
            Transport::Instance(listener, static_cast<std::uint32_t>(index), session_.UsedTransport());
        transport_->SetDataStageObserver(&wholeData_);
        transport_->GetDeviceIdentifier(opened);
        if (opened == identifier_) {
            commands_ = SmartPointer<CommandSet>(new CommandSet(transport_));
        }
    } catch (...) {
        session_.Files().Resume();
        session_.UserInterruption().ThrowIfRequested();
        FailureReport report = Describe(std::current_exception());
        if (const std::string holder = HolderOf(identifier_);
            report.code == ExitCode::NotAvailable && !holder.empty()) {
            report.message = "in use by " + holder;
            report.advice = "end that program: an instrument belongs to one process at a time";
        }
        throw ToolFailure(report.code, identifier_ + ": " + report.message, report.advice);
    }
    if (opened != identifier_) {
        throw ToolFailure(ExitCode::NoInstrument, "instruments were plugged in or out meanwhile",
                          "try again");
    }
    session_.SetInstrumentInUse(identifier_);
}

std::string Instrument::ChipId() {
    std::array<std::uint8_t, 8> id{};
    transport_->GetChipID(id.data());
    return HexOf(id);
}

Instrument::~Instrument() {
    // After an interruption too: closing waits for answers to what it sends.
    session_.Files().Resume();
    try {
        if (messageListener_ != nullptr) {
            transport_->RemoveListener(messageListener_);
        }
    } catch (...) {  // closing takes the listener away as well
    }
}

}  // namespace Varnholt::Cli
