#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <system_error>
#include <utility>

#include "Service/Interruption.h"
#include "Terminal.h"

namespace Varnholt::Cli {

/// An open file, pipe, terminal or device that is written to without a buffer in between. One thread at a
/// time. Errors are codes of the generic category.
class OutputDescriptor final {
  public:
    /// Closed by the object only where it has opened them.
    static OutputDescriptor Of(Standard stream);
    /// A new file; one that is there already is an error.
    static OutputDescriptor Create(const std::string& path, std::error_code& error);
    /// What is there and is no ordinary file. Waits for the reader of a FIFO, until the user wants to end:
    /// then the error is `std::errc::operation_canceled`.
    static OutputDescriptor Open(const std::string& path, const Service::Interruption& interruption,
                                 std::error_code& error);

    OutputDescriptor(OutputDescriptor&& other) noexcept
        : descriptor_(std::exchange(other.descriptor_, -1)),
          isOwn_(other.isOwn_),
          isFile_(other.isFile_),
          patienceEnd_(other.patienceEnd_) {}
    OutputDescriptor& operator=(OutputDescriptor&&) = delete;
    ~OutputDescriptor() { Close(); }

    struct Outcome {
        std::size_t accepted = 0;  ///< bytes, from the front
        std::error_code error;     ///< none: all of them
    };
    /// What cannot take more at the moment is waited for. Once the user wants to end, it is waited for no
    /// longer than a moment in all; what then has no room is refused with `std::errc::operation_canceled`.
    /// On Windows an interruption shows between two pieces only, not while a pipe is full.
    Outcome Write(std::span<const char> bytes, const Service::Interruption& interruption);

    /// Of a file: ends it there.
    std::error_code Cut(std::uint64_t size);
    /// Of a file: returns when its content has reached the disk.
    std::error_code Sync();
    std::error_code Close();

  private:
    enum class Ownership { Own, Borrowed };
    OutputDescriptor(int openDescriptor, Ownership ownership);

    int WaitingTime(const Service::Interruption& interruption);
    std::error_code AwaitRoom(const Service::Interruption& interruption);

    int descriptor_;  ///< -1: closed
    bool isOwn_;
    bool isFile_;
    /// Till when something is waited for although the user wants to end.
    std::optional<std::chrono::steady_clock::time_point> patienceEnd_;
};

}  // namespace Varnholt::Cli
