#include "Linux/UdevRule.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <regex>
#include <sstream>

#include "Failure.h"
#include "Platform/Usb/UdevBus.h"

namespace Varnholt::Cli {
namespace {

const std::string Header =
    "# Written by `ostra register`: these USB devices are measuring instruments.\n"
    "# The library looks for the property; the tag gives the user at the seat access.\n";

std::string Match(const UsbId& id) {
    return fmt::format("ATTR{{idVendor}}==\"{}\", ATTR{{idProduct}}==\"{}\"", id.vendor, id.product);
}

std::string Mark() {
    return fmt::format("ENV{{{}}}=\"1\"", Platform::Usb::InterfaceClassProperty);
}

std::string RuleFor(const UsbId& id) {
    return fmt::format("SUBSYSTEM==\"usb\", ENV{{DEVTYPE}}==\"usb_device\", {}, {}, TAG+=\"uaccess\"\n",
                       Match(id), Mark());
}

/// Whatever else somebody has added to it by hand.
bool IsRuleFor(const UsbId& id, const std::string& line) {
    return line.find_first_not_of(" \t") != line.find('#') && line.find(Match(id)) != std::string::npos &&
           line.find(Mark()) != std::string::npos;
}

}  // namespace

UsbId ParseUsbId(const std::string& text) {
    static const std::regex form("([0-9A-Fa-f]{4}):([0-9A-Fa-f]{4})");
    std::smatch match;
    if (!std::regex_match(text, match, form)) {
        throw ToolFailure(ExitCode::Usage, fmt::format("'{}' is no vendor and product number", text),
                          "give them as four hexadecimal digits each, such as 1209:0001; "
                          "`ostra list --candidates` shows those of the devices that could be instruments");
    }
    const auto lower = [](std::string digits) {
        std::ranges::transform(digits, digits.begin(),
                               [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
        return digits;
    };
    return {lower(match[1]), lower(match[2])};
}

std::string WithRule(const std::string& rules, const UsbId& id) {
    if (!WithoutRule(rules, id).changed) {
        const bool endsInLine = !rules.empty() && !rules.ends_with('\n');
        return (rules.empty() ? Header : rules) + (endsInLine ? "\n" : "") + RuleFor(id);
    }
    return rules;
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
    if (left.rules == Header) {
        left.rules.clear();
    }
    return left;
}

}  // namespace Varnholt::Cli
