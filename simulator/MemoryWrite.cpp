#include "MemoryWrite.h"

#include <algorithm>

namespace Varnholt::Simulator {

void MemoryWrite::Start(std::vector<std::uint8_t>& target, std::uint32_t address, std::uint32_t length) {
    memory_ = &target;
    next_ = address;
    missing_ = length;
    closingTransfersMissing_ = ClosingTransfers;
}

void MemoryWrite::Stop() {
    memory_ = nullptr;
}

MemoryWrite::Outcome MemoryWrite::Take(std::span<const std::uint8_t> data) {
    if (missing_ == 0) {
        if (--closingTransfersMissing_ == 0) {
            Stop();
        }
        return Outcome::Taken;
    }
    if (data.size() > missing_) {
        Stop();
        return Outcome::Refused;
    }
    const auto place = memory_->begin() + static_cast<std::ptrdiff_t>(next_);
    const bool changed = !std::equal(data.begin(), data.end(), place);
    std::ranges::copy(data, place);
    next_ += static_cast<std::uint32_t>(data.size());
    missing_ -= static_cast<std::uint32_t>(data.size());
    return changed ? Outcome::Changed : Outcome::Taken;
}

}  // namespace Varnholt::Simulator
