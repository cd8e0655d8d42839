#pragma once

#include <cstdint>
#include <span>
#include <vector>

namespace Varnholt::Simulator {

/// A write into the instrument's memory that a request has announced: the data follow on the bulk OUT
/// endpoint, and then two transfers that only say that they are complete.
class MemoryWrite final {
  public:
    /// `memory` must hold the range and outlive the write.
    void Start(std::vector<std::uint8_t>& memory, std::uint32_t address, std::uint32_t length);
    void Stop();

    /// Data are expected; otherwise a bulk OUT transfer has to wait.
    bool Active() const { return memory_ != nullptr; }

    enum class Outcome {
        Taken,
        Changed,  ///< taken, and the memory now differs
        Refused,  ///< more than was announced
    };
    /// One bulk OUT transfer, not empty.
    Outcome Take(std::span<const std::uint8_t> data);

  private:
    static constexpr int ClosingTransfers = 2;

    std::vector<std::uint8_t>* memory_ = nullptr;
    std::uint32_t next_ = 0;
    std::uint32_t missing_ = 0;
    int closingTransfersMissing_ = 0;
};

}  // namespace Varnholt::Simulator
