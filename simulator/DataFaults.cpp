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

void DataFaults::ReplaceOut(Passage& passage) {
    Bytes& data = passage.replacedData;
    data.assign(passage.data, passage.data + passage.length);
    if (passage.Has(FaultKind::Garbage)) {
        FillWithGarbage(data.data(), data.size(), script_.Hits());
    } else if (passage.Has(FaultKind::Flip)) {
        FlipBit(data.data(), data.size(), passage.fault->argument.value_or(0));
    } else {
        const std::lock_guard lock(mutex_);
        data = lastData_[{passage.endpoint, false}];
        data.resize(passage.length);
    }
    passage.data = data.data();
}

void DataFaults::KeepOut(const Passage& passage) {
    if (keepsData_) {
        const std::lock_guard lock(mutex_);
        lastData_[{passage.endpoint, false}].assign(passage.data, passage.data + passage.length);
    }
}

std::optional<std::uint32_t> DataFaults::RepeatIn(Passage& passage) {
    const std::lock_guard lock(mutex_);
    const auto last = lastData_.find({passage.endpoint, true});
    if (last == lastData_.end()) {
        return std::nullopt;
    }
    const auto length =
        static_cast<std::uint32_t>(std::min<std::size_t>(passage.length, last->second.size()));
    std::copy_n(last->second.begin(), length, passage.data);
    return length;
}

void DataFaults::ChangeIn(Passage& passage) {
    if (passage.Has(FaultKind::Garbage)) {
        FillWithGarbage(passage.data, passage.actualLength, script_.Hits());
    } else if (passage.Has(FaultKind::Flip)) {
        FlipBit(passage.data, passage.actualLength, passage.fault->argument.value_or(0));
    }
    if (keepsData_) {
        try {
            const std::lock_guard lock(mutex_);
            lastData_[{passage.endpoint, true}].assign(passage.data, passage.data + passage.actualLength);
        } catch (const std::bad_alloc&) {  // older data are as stale
        }
    }
}

}  // namespace Varnholt::Simulator
