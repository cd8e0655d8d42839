#include "AnswerStream.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace Varnholt::Simulator {

void AnswerStream::StartMeasurement(const Exposure& newExposure, std::uint64_t number, std::uint64_t bytes) {
    Stop();
    content_.reserve(static_cast<std::size_t>(
        std::min<std::uint64_t>(BytesBeforeRepeat, bytes + Protocol::ReadoutBytes - 1)));
    exposure_ = newExposure;
    measurement_ = number;
    measuring_ = true;
    total_ = bytes;
    endDue_ = bytes == 0;
}

void AnswerStream::StartMemory(std::vector<std::uint8_t> bytes) {
    Stop();
    content_ = std::move(bytes);
    total_ = content_.size();
}

void AnswerStream::Stop() {
    content_.clear();
    measuring_ = false;
    total_ = 0;
    position_ = 0;
    endDue_ = false;
}

void AnswerStream::MakeRecords(std::size_t bytes) {
    while (content_.size() < std::min(bytes, BytesBeforeRepeat)) {
        const std::size_t start = content_.size();
        content_.resize(start + Protocol::ReadoutBytes);
        sensor_.Read(exposure_, measurement_, static_cast<std::uint32_t>(start / Protocol::ReadoutBytes),
                     SensorModel::Record(&content_[start], Protocol::ReadoutBytes));
    }
}

std::uint32_t AnswerStream::Take(std::uint8_t* buffer, std::uint32_t length) {
    const auto count = static_cast<std::uint32_t>(std::min<std::uint64_t>(length, Remaining()));
    std::size_t place = static_cast<std::size_t>(position_);
    if (measuring_) {
        place = static_cast<std::size_t>(position_ % BytesBeforeRepeat);
        MakeRecords(place + count);
    }
    for (std::uint32_t done = 0; done < count;) {
        const std::size_t piece = std::min<std::size_t>(count - done, content_.size() - place);
        std::memcpy(buffer + done, &content_[place], piece);
        done += static_cast<std::uint32_t>(piece);
        place = 0;
    }
    position_ += count;
    endDue_ = measuring_ && position_ == total_ && count == length;
    return count;
}

}  // namespace Varnholt::Simulator
