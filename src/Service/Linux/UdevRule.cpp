#include "Service/Linux/UdevRule.h"

#include <fmt/format.h>

#include <algorithm>
#include <sstream>
#include <string_view>

#include "Platform/Usb/UdevBus.h"
#include "Service/Failure.h"
#include "Service/Number.h"

namespace Varnholt::Service {
namespace {

constexpr std::string_view Header =
    "# Written by `ostra register`: these USB devices are measuring instruments.\n"
    "# The library looks for the property; the tag gives the user at the seat access, the group its "
    "members.\n";
/// As versions before the group's wrote it.
constexpr std::string_view OldHeader =
    "# Written by `ostra register`: these USB devices are measuring instruments.\n"
    "# The library looks for the property; the tag gives the user at the seat access.\n";

std::string Match(const UsbId& id) {
    return fmt::format("ATTR{{idVendor}}==\"{}\", ATTR{{idProduct}}==\"{}\"", id.vendor, id.product);
}

std::string Mark() {
    return fmt::format("ENV{{{}}}=\"1\"", Platform::Usb::InterfaceClassProperty);
}

/// As versions before the group's wrote it.
std::string OldRuleFor(const UsbId& id) {
    return fmt::format("SUBSYSTEM==\"usb\", ENV{{DEVTYPE}}==\"usb_device\", {}, {}, TAG+=\"uaccess\"",
                       Match(id), Mark());
}

std::string RuleFor(const UsbId& id) {
    return fmt::format("{}, MODE=\"0660\", GROUP=\"{}\"", OldRuleFor(id), InstrumentGroup);
}

/// Whatever else somebody has added to it by hand.
bool IsRuleFor(const UsbId& id, const std::string& line) {
    return line.find_first_not_of(" \t") != line.find('#') && line.find(Match(id)) != std::string::npos &&
           line.find(Mark()) != std::string::npos;
}

}  // namespace

UsbId ParseUsbId(const std::string& text) {
    constexpr std::size_t digits = 4;
    const auto vendor = ParseHexadecimal(text.substr(0, digits), digits);
    const auto product = ParseHexadecimal(text.substr(std::min(digits + 1, text.size())), digits);
    if (text.find(':') != digits || !vendor || !product) {
        throw Failure(FailureKind::BadArgument, fmt::format("'{}' is no vendor and product number", text),
                      "give them as four hexadecimal digits each, such as 1209:0001; "
                      "`ostra list --candidates` shows those of the devices that could be instruments");
    }
    return {*vendor, *product};
}

std::string WithRule(const std::string& rules, const UsbId& id) {
    std::string changed = rules.empty() ? std::string(Header) : rules;
    if (changed.starts_with(OldHeader)) {
        changed.replace(0, OldHeader.size(), Header);
    }
    if (!WithoutRule(rules, id).changed) {
        return changed + (changed.ends_with('\n') ? "" : "\n") + RuleFor(id) + "\n";
    }
    std::string updated;
    std::istringstream lines(changed);
    for (std::string line; std::getline(lines, line);) {
        updated += (line == OldRuleFor(id) ? RuleFor(id) : line) + "\n";
    }
    if (!changed.ends_with('\n')) {
        updated.pop_back();
    }
    return updated;
}

RulesLeft WithoutRule(const std::string& rules, const UsbId& id) {
    RulesLeft left;
    std::istringstream lines(rules);
    for (std::string line; std::getline(lines, line);) {
        if (IsRuleFor(id, line)) {
            left.changed = true;
        } else {
            left.rules += line + "\n";
        }
    }
    if (left.rules == Header || left.rules == OldHeader) {
        left.rules.clear();
    }
    return left;
}

}  // namespace Varnholt::Service
