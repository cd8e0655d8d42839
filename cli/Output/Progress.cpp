#include "Output/Progress.h"

#include <fmt/format.h>

#include <algorithm>
#include <ostream>

namespace Varnholt::Cli {
namespace {

constexpr std::chrono::milliseconds DrawInterval{100};
constexpr std::size_t BarWidth = 24;

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

Progress::Progress(std::ostream& terminal, bool isTerminal, std::string what, std::uint64_t all,
                   std::string unitText)
    : stream(terminal), draws(isTerminal), title(std::move(what)), total(all), unit(std::move(unitText)) {}

Progress::~Progress() {
    if (drawn > 0) {
        stream << '\r' << std::string(drawn, ' ') << '\r' << std::flush;
    }
}

std::string Progress::LineFor(const std::string& title, std::uint64_t done, std::uint64_t total,
                              const std::string& unit, double seconds) {
    const bool isBytes = unit == "B";
    const auto amount = [&](std::uint64_t count) {
        return isBytes ? SizeText(static_cast<double>(count)) : std::to_string(count);
    };
    std::string line = title + "  ";
    if (total > 0) {
        const std::uint64_t shown = std::min(done, total);
        const auto filled =
            static_cast<std::size_t>(static_cast<double>(shown) * BarWidth / static_cast<double>(total));
        line += "[" + std::string(filled, '=') + std::string(BarWidth - filled, ' ') + "]  ";
        line += amount(done) + " of " + amount(total);
    } else {
        line += amount(done);
    }
    if (!isBytes) {
        line += " " + unit;
    } else if (seconds > 0) {
        line += "  " + SizeText(static_cast<double>(done) / seconds) + "/s";
    }
    return line;
}

void Progress::Update(std::uint64_t done) {
    const Clock::time_point now = Clock::now();
    if (!draws || (now < next && (total == 0 || done < total))) {
        return;
    }
    next = now + DrawInterval;
    const std::string line =
        LineFor(title, done, total, unit, std::chrono::duration<double>(now - start).count());
    const std::size_t rest = drawn > line.size() ? drawn - line.size() : 0;
    stream << '\r' << line << std::string(rest, ' ') << std::flush;
    drawn = std::max(drawn, line.size());
}

}  // namespace Varnholt::Cli
