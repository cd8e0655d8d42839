#pragma once

#include <pybind11/numpy.h>
#include <pybind11/pybind11.h>

#include <cstddef>
#include <deque>
#include <exception>
#include <memory>
#include <mutex>
#include <span>

#include "BlockPool.h"
#include "Instrument.h"
#include "Platform/Handle.h"
#include "Platform/WaitableObjects.h"
#include "Service/ScanRun.h"

namespace Varnholt::Python {

/// A scan that runs on a thread of its own, and the records that have come and were not taken yet: a MiB at
/// most, then the instrument waits. One thread takes them; any may close it.
class ScanStream final {
  public:
    /// While it is the calling thread's turn with the instrument.
    ScanStream(std::shared_ptr<Instrument> instrument, const Service::ScanSettings& settings, bool asBytes);
    ~ScanStream();
    ScanStream(const ScanStream&) = delete;
    ScanStream& operator=(const ScanStream&) = delete;

    /// The next records that have come, at least one: values of shape (n, record size / 2), or bytes of shape
    /// (n, record size). None at the end. Raises what ended the scan, once, when the records are out.
    py::object Next();
    /// Ends the scan, which resets the instrument, and drops what was not taken. Harmless afterwards.
    void Close();

    bool IsRunning();
    std::uint64_t Received() const { return report_.received; }  ///< bytes; once it has ended
    double Seconds() const { return static_cast<double>(milliseconds_) / 1000; }
    py::bytes LeftOver() const;

  private:
    /// Records as they are handed out: their values, or their bytes.
    struct Block {
        BlockPool::Memory memory;
        std::size_t bytes = 0;           ///< of the records
        std::uint64_t milliseconds = 0;  ///< of the scan when the last of them came
    };

    void TakeRecords(std::span<const std::uint8_t> records, std::uint64_t milliseconds);
    std::size_t Append(std::span<const std::uint8_t> records);
    void Run();
    bool HasEnough() const;
    bool AwaitData();
    void Join(bool mustInterrupt);
    template <class Element>
    py::object ArrayOf(Block block) const;

    const std::shared_ptr<Instrument> instrument_;
    const Service::ScanSettings settings_;
    const bool asBytes_;
    Service::ScanReport report_;
    const std::shared_ptr<BlockPool> pool_ = std::make_shared<BlockPool>();
    const Platform::OwnedHandle filled_{Platform::MakeAutoResetEvent()};
    const Platform::OwnedHandle drained_{Platform::MakeAutoResetEvent()};
    Platform::RecursiveMutex section_;  ///< guards what follows
    std::deque<Block> waiting_;
    std::exception_ptr failure_;
    bool isFailed_ = false;
    bool hasEnded_ = false;
    bool mustEnd_ = false;
    std::uint64_t milliseconds_ = 0;  ///< of the records taken last
    std::mutex joining_;
    Platform::OwnedHandle thread_;
};

}  // namespace Varnholt::Python
