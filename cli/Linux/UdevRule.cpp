#include "Linux/UdevRule.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <regex>

#include "Failure.h"
#include "Platform/Usb/UdevBus.h"

namespace Varnholt::Cli {

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

std::string UdevRules(const std::vector<UsbId>& ids) {
    std::string text =
        "# Written by `ostra register`: these USB devices are measuring instruments.\n"
        "# The library looks for the property; the tag gives the user at the seat access.\n";
    for (const UsbId& id : ids) {
        text += fmt::format(
            "SUBSYSTEM==\"usb\", ENV{{DEVTYPE}}==\"usb_device\", ATTR{{idVendor}}==\"{}\", "
            "ATTR{{idProduct}}==\"{}\", "
            "ENV{{{}}}=\"1\", TAG+=\"uaccess\"\n",
            id.vendor, id.product, Platform::Usb::InterfaceClassProperty);
    }
    return text;
}

std::vector<UsbId> IdsInRules(const std::string& rules) {
    static const std::regex form(
        R"re(ATTR\{idVendor\}=="([0-9a-f]{4})", ATTR\{idProduct\}=="([0-9a-f]{4})")re");
    std::vector<UsbId> ids;
    for (std::sregex_iterator rule(rules.begin(), rules.end(), form), end; rule != end; ++rule) {
        ids.push_back({(*rule)[1], (*rule)[2]});
    }
    return ids;
}

}  // namespace Varnholt::Cli
