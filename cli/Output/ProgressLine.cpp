#include "Output/ProgressLine.h"

#include <fmt/format.h>

#include <algorithm>
#include <ostream>

namespace Varnholt::Cli {
namespace {

constexpr std::chrono::milliseconds DrawInterval{100};
constexpr std::size_t BarWidth = 24;
constexpr std::size_t ShortestBar = 4;

/// Behind a character in the last column some terminals begin a new line.
std::size_t UsableColumns(const StreamFacts& facts) {
    return static_cast<std::size_t>(std::max(facts.size().columns - 1, 1));
}

std::string Bar(std::uint64_t done, std::uint64_t total, std::size_t width) {
    const auto filled = static_cast<std::size_t>(static_cast<double>(done) * static_cast<double>(width) /
                                                 static_cast<double>(total));
    return "[" + std::string(filled, '=') + std::string(width - filled, ' ') + "]  ";
}

}  // namespace

std::string SizeText(double bytes) {
    if (bytes < 1000) {
        return fmt::format("{:.0f} B", bytes);
    }
    const char* unit = "kB";
    bytes /= 1000;
    for (const char* larger : {"MB", "GB"}) {
        if (bytes < 999.95) {
            break;
        }
        bytes /= 1000;
        unit = larger;
    }
    return fmt::format("{:.1f} {}", bytes, unit);
}

std::string CountText(std::uint64_t count, const std::string& noun) {
    return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

ProgressLine::ProgressLine(std::ostream& terminal, StreamFacts facts, std::string what, std::uint64_t all,
                           std::string unitText)
    : stream_(terminal),
      terminalFacts_(std::move(facts)),
      title_(std::move(what)),
      total_(all),
      unit_(std::move(unitText)) {}

ProgressLine::~ProgressLine() {
    if (drawn_ > 0) {
        stream_ << '\r' + std::string(std::min(drawn_, UsableColumns(terminalFacts_)), ' ') + '\r'
                << std::flush;
    }
}

std::string ProgressLine::LineFor(const std::string& title, std::uint64_t done, std::uint64_t total,
                                  const std::string& unit, double seconds, std::size_t columns) {
    const bool isBytes = unit == "B";
    const auto amount = [&](std::uint64_t count) {
        return isBytes ? SizeText(static_cast<double>(count)) : std::to_string(count);
    };
    const std::string head = title + "  ";
    std::string numbers = amount(done);
    if (total > 0) {
        numbers += " of " + amount(total);
    }
    if (!isBytes) {
        numbers += " " + unit;
    } else if (seconds > 0) {
        numbers += "  " + SizeText(static_cast<double>(done) / seconds) + "/s";
    }
    constexpr std::size_t around = 4;  // of a bar
    const std::size_t used = head.size() + numbers.size() + around;
    const std::size_t room = columns > used ? columns - used : 0;
    const bool hasBar = total > 0 && room >= ShortestBar;
    return (head + (hasBar ? Bar(std::min(done, total), total, std::min(room, BarWidth)) : "") + numbers)
        .substr(0, columns);
}

void ProgressLine::Update(std::uint64_t done) {
    const Clock::time_point now = Clock::now();
    if (!terminalFacts_.movesCursor || (now < next_ && (total_ == 0 || done < total_))) {
        return;
    }
    next_ = now + DrawInterval;
    const std::size_t columns = UsableColumns(terminalFacts_);
    std::string line =
        LineFor(title_, done, total_, unit_, std::chrono::duration<double>(now - start_).count(), columns);
    drawn_ = std::max(std::min(drawn_, columns), line.size());
    line.resize(drawn_, ' ');  // over what is longer from before
    stream_ << '\r' + line << std::flush;
}

}  // namespace Varnholt::Cli
