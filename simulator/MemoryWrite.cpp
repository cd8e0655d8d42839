#include "MemoryWrite.h"

#include <algorithm>

namespace Varnholt::Simulator {

void MemoryWrite::Start(std::vector<std::uint8_t>& target, std::uint32_t address, std::uint32_t length) {
    memory = &target;
    next = address;
    missing = length;
    closingTransfersMissing = ClosingTransfers;
}

void MemoryWrite::Stop() {
    memory = nullptr;
}

MemoryWrite::Outcome MemoryWrite::Take(std::span<const std::uint8_t> data) {
    if (missing == 0) {
        if (--closingTransfersMissing == 0) {
            Stop();
        }
        return Outcome::Taken;
    }
    if (data.size() > missing) {
        Stop();
        return Outcome::Refused;
    }
    const auto place = memory->begin() + static_cast<std::ptrdiff_t>(next);
    const bool changed = !std::equal(data.begin(), data.end(), place);
    std::ranges::copy(data, place);
    next += static_cast<std::uint32_t>(data.size());
    missing -= static_cast<std::uint32_t>(data.size());
    return changed ? Outcome::Changed : Outcome::Taken;
}

}  // namespace Varnholt::Simulator
