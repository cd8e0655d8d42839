#pragma once

#include <array>
#include <cstdint>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "Protocol/EndpointNames.h"

namespace Varnholt::Simulator {

/// What goes wrong with one transfer. "Not passed on" means that the device never sees it.
enum class FaultKind {
    Stall,       ///< STALL; not passed on. An endpoint other than 0 stalls until its halt is cleared
    IoError,     ///< a bus error; not passed on
    Overflow,    ///< the device sent too much and nothing can be used; not passed on
    Silent,      ///< never answered; ends when it is cancelled; not passed on
    Short,       ///< only the first N bytes move (half of them without N); a device that has more keeps it
    Empty,       ///< completes with no data; not passed on
    Long,        ///< in: the data come, and with them the report that there was more. Out: as Overflow
    Stale,       ///< the data of the transfer before, of the same endpoint and direction; in: not passed on
    Garbage,     ///< data that mean nothing, as many as there should be
    Flip,        ///< bit N of the data is wrong (bit 0 of byte 0 without N)
    Late,        ///< passed on after N milliseconds
    LateCancel,  ///< done when it is cancelled and not before: cancelled, yet with its data
    GoneBefore,  ///< the device is unplugged before the transfer is accepted
    GoneDuring,  ///< unplugged under the transfer; of bulk data out, half is written
    GoneAfter,   ///< unplugged once the transfer is complete
};

struct Fault {
    std::optional<std::uint8_t> endpoint;  ///< whose transfers are counted; nothing: all
    std::uint32_t index = 0;               ///< of the transfer among them, in order of submission, from 0
    bool fromThenOn = false;               ///< and every later one of them
    FaultKind kind = FaultKind::Stall;
    std::optional<std::uint32_t> argument;

    bool operator==(const Fault&) const = default;
};

/// Faults by transfer index, as a line of text:
///
///     3:stall; 7+:silent; bulk-in 2:short=10; control 0+:late=50
///
/// Each fault is an index (from 0), a plus if it stays from then on, a colon and the fault's name, with its
/// number where it has one; in front, perhaps, the kind of transfer that is counted instead of all:
/// control, bulk-in, bulk-out or interrupt. Of two faults for one transfer the first counts. Standard
/// requests, with which an operating system makes the device's acquaintance, are not counted and do not fail.
class FaultPlan final {
  public:
    FaultPlan() = default;
    explicit FaultPlan(std::vector<Fault> list) : faults_(std::move(list)) {}
    /// Throws `std::invalid_argument` with a text that says what is wrong and what could stand there.
    static FaultPlan Parse(std::string_view text);

    const std::vector<Fault>& Faults() const { return faults_; }
    bool Uses(FaultKind kind) const;

    bool operator==(const FaultPlan&) const = default;

  private:
    std::vector<Fault> faults_;
};

struct FaultName {
    FaultKind kind;
    std::string_view name;
    enum class Argument { None, Optional, Required } argument;
    std::string_view argumentName;
};
/// Every fault there is.
std::span<const FaultName> AllFaults();

/// A plan being carried out: counts the transfers, over as many openings of the instrument as share it. Any
/// thread.
class FaultScript final {
  public:
    explicit FaultScript(FaultPlan faultPlan) : plan_(std::move(faultPlan)) {}

    /// Counts a transfer of this endpoint and says what is to go wrong with it.
    std::optional<Fault> Next(std::uint8_t endpoint);
    const FaultPlan& Plan() const { return plan_; }

    std::uint32_t Hits() const;  ///< transfers so far that a fault was for

  private:
    const FaultPlan plan_;
    mutable std::mutex mutex_;  // guards what follows
    std::uint32_t all_ = 0;
    std::array<std::uint32_t, Protocol::EndpointNames.size()> counts_{};
    std::uint32_t hits_ = 0;
};

}  // namespace Varnholt::Simulator
