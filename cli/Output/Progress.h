#pragma once

#include <chrono>
#include <cstdint>
#include <iosfwd>
#include <string>

namespace Varnholt::Cli {

/// How far something has come, on one line of a terminal that is drawn over and over. Prints nothing anywhere
/// else.
class Progress final {
  public:
    /// `total` 0: not known. `unit` stands behind the numbers, "B" with a rate of bytes per second.
    Progress(std::ostream& terminal, bool isTerminal, std::string title, std::uint64_t total,
             std::string unit);
    /// Clears the line.
    ~Progress();
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    /// Cheap: draws at most ten times a second, and always when the total is reached.
    void Update(std::uint64_t done);

    /// The line that `Update` draws, without control characters.
    static std::string LineFor(const std::string& title, std::uint64_t done, std::uint64_t total,
                               const std::string& unit, double seconds);

  private:
    using Clock = std::chrono::steady_clock;

    std::ostream& stream;
    const bool draws;
    const std::string title;
    const std::uint64_t total;
    const std::string unit;
    const Clock::time_point start = Clock::now();
    Clock::time_point next = start;
    std::size_t drawn = 0;  ///< characters on the line
};

/// "256 B", "1.3 kB", "52.4 MB"
std::string SizeText(double bytes);

}  // namespace Varnholt::Cli
