#pragma once

#include <chrono>
#include <cstdint>
#include <iosfwd>
#include <string>

#include "Service/Observer.h"
#include "Terminal.h"

namespace Varnholt::Cli {

/// How far something has come, on one line of a terminal that is drawn over and over, and never longer than
/// the terminal is wide. Prints nothing anywhere else.
class ProgressLine final : public Service::Progress {
  public:
    /// `total` 0: not known. `unit` stands behind the numbers, "B" with a rate of bytes per second.
    ProgressLine(std::ostream& terminal, StreamFacts facts, std::string title, std::uint64_t total,
                 std::string unit);
    /// Clears the line.
    ~ProgressLine() override;
    ProgressLine(const ProgressLine&) = delete;
    ProgressLine& operator=(const ProgressLine&) = delete;

    /// Cheap: draws at most ten times a second, and always when the total is reached.
    void Update(std::uint64_t done) override;

    /// The line that `Update` draws, without control characters: at most `columns` of them, with a shorter
    /// bar, with none, or cut off where it would be longer.
    static std::string LineFor(const std::string& title, std::uint64_t done, std::uint64_t total,
                               const std::string& unit, double seconds, std::size_t columns);

  private:
    using Clock = std::chrono::steady_clock;

    std::ostream& stream_;
    const StreamFacts terminalFacts_;
    const std::string title_;
    const std::uint64_t total_;
    const std::string unit_;
    const Clock::time_point start_ = Clock::now();
    Clock::time_point next_ = start_;
    std::size_t drawn_ = 0;  ///< characters on the line
};

/// "256 B", "1.3 kB", "52.4 MB"
std::string SizeText(double bytes);
/// "1 record", "12 records"
std::string CountText(std::uint64_t count, const std::string& noun);

}  // namespace Varnholt::Cli
