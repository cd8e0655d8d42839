#include "Output/RecordCsv.h"

#include <fmt/format.h>

#include <algorithm>
#include <charconv>
#include <cstring>

#include "Interface/Readout.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Cli {
namespace {

constexpr std::size_t LongestValue = 6;    // and a comma or the line's end
constexpr std::size_t LongestNumber = 21;  // and a comma

}  // namespace

std::vector<RecordCsv::Cell> RecordCsv::MakeCells() {
    std::vector<Cell> made(0x10000);
    for (std::int32_t i = 0; i < 0x10000; ++i) {
        Cell& cell = made[static_cast<std::size_t>(i)];
        char* const begin = cell.text.data();
        char* const end = std::to_chars(begin, begin + cell.text.size(),
                                        Interface::ReadingOf(static_cast<std::uint16_t>(i)))
                              .ptr;
        *end = ',';
        cell.length = static_cast<std::uint8_t>(end + 1 - begin);
    }
    return made;
}

RecordCsv::RecordCsv(std::size_t recordSize, CsvColumns chosenColumns)
    : size_(recordSize),
      columns_(chosenColumns),
      longestLine_(2 * LongestNumber + recordSize / 2 * LongestValue) {}

std::string RecordCsv::Head() const {
    std::string head;
    head += columns_.number ? "record," : "";
    head += columns_.seconds ? "seconds," : "";
    for (std::size_t i = 0; i < size_ / 2; ++i) {
        head += std::to_string(i) + ',';
    }
    head.back() = '\n';
    return head;
}

std::span<const char> RecordCsv::Lines(std::span<const std::uint8_t> records, std::uint64_t number,
                                       std::uint64_t milliseconds) {
    text_.resize(std::max(text_.size(), records.size() / size_ * longestLine_ + sizeof(Cell)));
    const std::string seconds =
        columns_.seconds ? fmt::format("{}.{:03},", milliseconds / 1000, milliseconds % 1000) : "";
    char* at = text_.data();
    char* const end = at + text_.size();
    for (std::size_t i = 0; i < records.size(); i += size_) {
        if (columns_.number) {
            at = std::to_chars(at, end, number++).ptr;
            *at++ = ',';
        }
        at = std::copy(seconds.begin(), seconds.end(), at);
        for (std::size_t j = i; j < i + size_; j += 2) {
            const Cell& cell = cells_[Protocol::LoadBig16(records.data() + j)];
            std::memcpy(at, &cell, sizeof(cell));  // what is too much is written over
            at += cell.length;
        }
        at[-1] = '\n';
    }
    return std::span<const char>(text_).first(static_cast<std::size_t>(at - text_.data()));
}

}  // namespace Varnholt::Cli
