#include "AnswerStream.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace Varnholt::Simulator {

void AnswerStream::StartMeasurement(const Exposure& newExposure, std::uint64_t number, std::uint64_t bytes) {
    Stop();
    content.reserve(static_cast<std::size_t>(
        std::min<std::uint64_t>(BytesBeforeRepeat, bytes + Protocol::ReadoutBytes - 1)));
    exposure = newExposure;
    measurement = number;
    measuring = true;
    total = bytes;
    endDue = bytes == 0;
}

void AnswerStream::StartMemory(std::vector<std::uint8_t> bytes) {
    Stop();
    content = std::move(bytes);
    total = content.size();
}

void AnswerStream::Stop() {
    content.clear();
    measuring = false;
    total = 0;
    position = 0;
    endDue = false;
}

void AnswerStream::MakeRecords(std::size_t bytes) {
    while (content.size() < std::min(bytes, BytesBeforeRepeat)) {
        const std::size_t start = content.size();
        content.resize(start + Protocol::ReadoutBytes);
        sensor.Read(exposure, measurement, static_cast<std::uint32_t>(start / Protocol::ReadoutBytes),
                    SensorModel::Record(&content[start], Protocol::ReadoutBytes));
    }
}

std::uint32_t AnswerStream::Take(std::uint8_t* buffer, std::uint32_t length) {
    const auto count = static_cast<std::uint32_t>(std::min<std::uint64_t>(length, Remaining()));
    std::size_t place = static_cast<std::size_t>(position);
    if (measuring) {
        place = static_cast<std::size_t>(position % BytesBeforeRepeat);
        MakeRecords(place + count);
    }
    for (std::uint32_t done = 0; done < count;) {
        const std::size_t piece = std::min<std::size_t>(count - done, content.size() - place);
        std::memcpy(buffer + done, &content[place], piece);
        done += static_cast<std::uint32_t>(piece);
        place = 0;
    }
    position += count;
    endDue = measuring && position == total && count == length;
    return count;
}

std::vector<std::uint8_t> AnswerStream::Expected(std::uint64_t start, std::size_t length) const {
    AnswerStream other = *this;
    other.position = std::min(start, total);
    std::vector<std::uint8_t> bytes(length);
    bytes.resize(length == 0 ? 0 : other.Take(bytes.data(), static_cast<std::uint32_t>(length)));
    return bytes;
}

}  // namespace Varnholt::Simulator
