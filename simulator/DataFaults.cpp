#include "DataFaults.h"

#include <algorithm>
#include <new>

namespace Varnholt::Simulator {

namespace {

void FillWithGarbage(std::uint8_t* data, std::size_t length, std::uint32_t seed) {
    std::uint32_t state = seed * 2654435761U + 1;
    for (std::size_t i = 0; i < length; ++i) {
        state = state * 1664525U + 1013904223U;
        data[i] = static_cast<std::uint8_t>(state >> 24);
    }
}

void FlipBit(std::uint8_t* data, std::size_t length, std::uint32_t bit) {
    if (length > 0) {
        data[bit / 8 % length] ^= static_cast<std::uint8_t>(1U << bit % 8);
    }
}

}  // namespace

void DataFaults::ReplaceOut(FaultyTransfer& transfer) {
    Bytes& data = transfer.replacedData;
    data.assign(transfer.data, transfer.data + transfer.length);
    if (transfer.Has(FaultKind::Garbage)) {
        FillWithGarbage(data.data(), data.size(), script_.Hits());
    } else if (transfer.Has(FaultKind::Flip)) {
        FlipBit(data.data(), data.size(), transfer.fault->argument.value_or(0));
    } else {
        const std::lock_guard lock(mutex_);
        data = lastData_[{transfer.endpoint, false}];
        data.resize(transfer.length);
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
    if (transfer.Has(FaultKind::Garbage)) {
        FillWithGarbage(transfer.data, transfer.actualLength, script_.Hits());
    } else if (transfer.Has(FaultKind::Flip)) {
        FlipBit(transfer.data, transfer.actualLength, transfer.fault->argument.value_or(0));
    }
    if (keepsData_) {
        try {
            const std::lock_guard lock(mutex_);
            lastData_[{transfer.endpoint, true}].assign(transfer.data, transfer.data + transfer.actualLength);
        } catch (const std::bad_alloc&) {  // older data are as stale
        }
    }
}

}  // namespace Varnholt::Simulator
