#pragma once

#include <cstdint>
#include <memory>
#include <span>

#include "DeviceDriver/Ostra/LowLevel/Win32/USBConnection.h"
#include "Platform/ErrorCodes.h"
#include "Platform/OverlappedRequest.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// The reads of a strip read: one that is waited for, one queued behind it so that the instrument can keep
/// streaming, and the data of the one before, which are being copied out meanwhile. Three buffers of one
/// chunk change places.
///
///     reader.Start(size); reader.Advance();                  // the first read
///     loop: reader.Start(size); use reader.Arrived(); reader.Await(limit); reader.Advance();
///
/// The end of the object cancels what still runs and waits for it before the buffers go. Used by one thread.
class StripReader final {
  public:
    /// `connection` outlives the reader.
    StripReader(const USBConnection& connection, std::uint32_t chunk);
    StripReader(const StripReader&) = delete;
    StripReader& operator=(const StripReader&) = delete;

    /// Queues a read of `size` bytes, at most one chunk, behind the one that is waited for. A start that
    /// fails shows in that read's result.
    void Start(std::uint32_t size);

    /// Waits for the oldest read, at most `limit` milliseconds.
    Platform::WaitResult Await(std::uint32_t limit);

    /// The outcome of the read that `Await` waited for; not successful also when it still runs.
    bool HasSucceeded() const { return succeeded_; }
    /// Why not: `Errors::IoIncomplete` when it still ran.
    Platform::ErrorCode FailureCode() const { return failure_; }
    std::uint32_t Count() const { return count_; }

    /// Makes the data of the read that was waited for the arrived data, and the read behind it the one to
    /// wait for.
    void Advance();

    std::span<const std::uint8_t> Arrived() const { return {arrived_.get(), arrivedCount_}; }

    /// Ends the read that was waited for, if it still runs, and gives what it has brought. For a read that
    /// failed; nothing can be started afterwards.
    std::span<const std::uint8_t> EndAndTake();

  private:
    using Buffer = std::unique_ptr<std::uint8_t[]>;
    struct PendingRead {
        PendingRead(Platform::Handle event, std::uint32_t chunk);

        Buffer buffer;  ///< before the request, which ends first
        Platform::OverlappedRequest request;
        std::uint32_t asked = 0;
    };

    bool FetchResult();

    const Platform::Handle pipe_;
    Buffer arrived_;
    std::uint32_t arrivedCount_ = 0;
    PendingRead first_;
    PendingRead second_;
    PendingRead* waiting_ = &first_;
    PendingRead* following_ = &second_;
    bool succeeded_ = false;
    Platform::ErrorCode failure_ = Platform::Errors::Success;
    std::uint32_t count_ = 0;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
