#pragma once

#include <string>
#include <vector>

namespace Varnholt::Cli {

/// A vendor and product number, four lower-case hexadecimal digits each.
struct UsbId {
    std::string vendor;
    std::string product;

    bool operator==(const UsbId&) const = default;
};

/// Reads "VID:PID"; `ToolFailure` says what is wrong with another text.
UsbId ParseUsbId(const std::string& text);

/// Before 73-seat-late.rules, which gives the user at the seat access to what is tagged until then.
inline constexpr const char* UdevRuleFile = "/etc/udev/rules.d/70-ostra.rules";

/// The whole rule file for these devices: marks them as instruments and gives the user at the seat access.
std::string UdevRules(const std::vector<UsbId>& ids);

/// The devices that a rule file of that form names, in order.
std::vector<UsbId> IdsInRules(const std::string& rules);

}  // namespace Varnholt::Cli
