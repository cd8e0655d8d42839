#include "DataFaults.h"

#include <algorithm>
#include <new>
#include <span>

namespace Varnholt::Simulator {

namespace {

/// Garbage, or a wrong bit, where the transfer has that fault.
void Spoil(std::span<std::uint8_t> data, const FaultyTransfer& transfer, std::uint32_t seed) {
    if (transfer.Has(FaultKind::Garbage)) {
        std::uint32_t state = seed * 2654435761U + 1;
        for (std::uint8_t& byte : data) {
            state = state * 1664525U + 1013904223U;
            byte = static_cast<std::uint8_t>(state >> 24);
        }
    } else if (transfer.Has(FaultKind::Flip) && !data.empty()) {
        const std::uint32_t bit = transfer.fault->argument.value_or(0);
        data[bit / 8 % data.size()] ^= static_cast<std::uint8_t>(1U << bit % 8);
    }
}

}  // namespace

void DataFaults::ReplaceOut(FaultyTransfer& transfer) {
    Bytes& data = transfer.replacedData;
    if (transfer.Has(FaultKind::Stale)) {
        const std::lock_guard lock(mutex_);
        data = lastData_[{transfer.endpoint, false}];
        data.resize(transfer.length);
    } else {
        data.assign(transfer.data, transfer.data + transfer.length);
        Spoil(data, transfer, script_.Hits());
    }
    transfer.data = data.data();
}

void DataFaults::KeepOut(const FaultyTransfer& transfer) {
    if (keepsData_) {
        const std::lock_guard lock(mutex_);
        lastData_[{transfer.endpoint, false}].assign(transfer.data, transfer.data + transfer.length);
    }
}

std::optional<std::uint32_t> DataFaults::RepeatIn(FaultyTransfer& transfer) {
    const std::lock_guard lock(mutex_);
    const auto last = lastData_.find({transfer.endpoint, true});
    if (last == lastData_.end()) {
        return std::nullopt;
    }
    const auto length =
        static_cast<std::uint32_t>(std::min<std::size_t>(transfer.length, last->second.size()));
    std::copy_n(last->second.begin(), length, transfer.data);
    return length;
}

void DataFaults::ChangeIn(FaultyTransfer& transfer) {
    Spoil({transfer.data, transfer.actualLength}, transfer, script_.Hits());
    if (keepsData_) {
        try {
            const std::lock_guard lock(mutex_);
            lastData_[{transfer.endpoint, true}].assign(transfer.data, transfer.data + transfer.actualLength);
        } catch (const std::bad_alloc&) {  // older data are as stale
        }
    }
}

}  // namespace Varnholt::Simulator
