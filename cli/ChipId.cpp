#include "ChipId.h"

#include <algorithm>
#include <cctype>
#include <string_view>

namespace Varnholt::Cli {
namespace {

constexpr std::string_view Prefix = "chip:";
constexpr std::size_t Digits = 16;

std::string LowerCase(std::string text) {
    std::ranges::transform(text, text.begin(),
                           [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return text;
}

}  // namespace

ChipIdAnswer AskChipId(Session& session, const std::string& identifier, const std::string& transport) {
    ChipIdAnswer answer;
    try {
        answer.chipId = Instrument(session, {identifier, transport}).ChipId();
    } catch (...) {
        answer.problem = session.Explain(std::current_exception());
        if (answer.problem.code == ExitCode::Interrupted) {
            throw;
        }
    }
    session.SetInstrumentInUse({});
    return answer;
}

bool NamesChip(const std::string& device) {
    return device.starts_with(Prefix);
}

std::string FindByChipId(Session& session, const std::vector<std::string>& identifiers,
                         const InstrumentOptions& options) {
    const std::string wanted = LowerCase(options.device.substr(Prefix.size()));
    if (wanted.size() != Digits ||
        !std::ranges::all_of(wanted, [](unsigned char c) { return std::isxdigit(c) != 0; })) {
        throw ToolFailure(ExitCode::Usage,
                          "'" + options.device + "' names no chip: an id has 16 hexadecimal digits",
                          "`ostra list --chip-id` shows the chip ids");
    }
    std::string notAsked;
    ExitCode code = ExitCode::NoInstrument;
    for (const std::string& identifier : identifiers) {
        const ChipIdAnswer answer = AskChipId(session, identifier, options.transport);
        if (answer.chipId == wanted) {
            return identifier;
        }
        if (answer.chipId.empty()) {
            code = notAsked.empty() ? answer.problem.code : code;
            notAsked += (notAsked.empty() ? "" : "; ") + answer.problem.message;
        }
    }
    if (!notAsked.empty()) {
        throw ToolFailure(
            code, "no instrument that could be asked is " + options.device + "; not asked: " + notAsked,
            "`ostra list --chip-id` shows the chip ids");
    }
    throw ToolFailure(ExitCode::NoInstrument, "no instrument " + options.device + " is connected",
                      "`ostra list --chip-id` shows the chip ids");
}

}  // namespace Varnholt::Cli
