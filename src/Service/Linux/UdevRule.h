#pragma once

#include <string>

namespace Varnholt::Service {

/// A vendor and product number, four lower-case hexadecimal digits each.
struct UsbId {
    std::string vendor;
    std::string product;
};

/// Reads "VID:PID"; `Failure` says what is wrong with another text.
UsbId ParseUsbId(const std::string& text);

/// Before 73-seat-late.rules, which gives the user at the seat access to what is tagged until then.
inline constexpr const char* UdevRuleFile = "/etc/udev/rules.d/70-ostra.rules";

/// Its members may use a registered instrument from anywhere: over SSH, from a service.
inline constexpr const char* InstrumentGroup = "plugdev";

/// The content of a rule file with a rule that marks a device as an instrument and gives the user at the seat
/// and the group access. A rule as an older version wrote it is brought up to date; what else is in the file
/// stays as it is.
std::string WithRule(const std::string& rules, const UsbId& id);

struct RulesLeft {
    std::string rules;     ///< empty when nothing is left
    bool changed = false;  ///< false: there was no such rule
};
RulesLeft WithoutRule(const std::string& rules, const UsbId& id);

}  // namespace Varnholt::Service
