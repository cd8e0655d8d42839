#include "Output/LiveBlock.h"

#include <fmt/format.h>

#include <algorithm>
#include <sstream>

namespace Varnholt::Cli {

std::string LiveBlock::Over(const std::string& lines) {
    if (!terminal_.movesCursor) {
        return lines;
    }
    const TerminalSize size = terminal_.size();
    std::string lead;
    if (linesBefore_ > 0) {
        lead = size == sizeBefore_ ? fmt::format("\r\x1b[{}A\x1b[J", linesBefore_) : "\x1b[H\x1b[2J";
    }
    sizeBefore_ = size;
    linesBefore_ = std::count(lines.begin(), lines.end(), '\n');
    return lead + lines;
}

std::string Wrapped(const std::string& text, std::size_t width) {
    std::istringstream words(text);
    std::string lines, line;
    for (std::string word; words >> word;) {
        if (!line.empty() && line.size() + 1 + word.size() > width) {
            lines += line + '\n';
            line.clear();
        }
        line += (line.empty() ? "" : " ") + word;
    }
    return lines + line + '\n';
}

}  // namespace Varnholt::Cli
