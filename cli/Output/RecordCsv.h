#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

namespace Varnholt::Cli {

/// Columns before the values of a record.
struct CsvColumns {
    bool number = false;   ///< of the record, from 1
    bool seconds = false;  ///< since the start
};

/// Records as lines of CSV: their pairs of bytes are readings, most significant byte first.
class RecordCsv final {
  public:
    /// All records have this size, an even number of bytes.
    RecordCsv(std::size_t recordSize, CsvColumns chosenColumns);

    /// The names of the columns: "record", "seconds" and the values' positions from 0.
    std::string Head() const;
    /// The lines of some whole records, the first of them with this number; all came at the same time. Valid
    /// until the next call.
    std::span<const char> Lines(std::span<const std::uint8_t> records, std::uint64_t number,
                                std::uint64_t milliseconds);

  private:
    /// A value's text and the comma behind it, in a size that is copied at once.
    struct Cell {
        std::array<char, 7> text;
        std::uint8_t length;
    };
    static_assert(sizeof(Cell) == 8);
    static std::vector<Cell> MakeCells();

    const std::vector<Cell> cells_ = MakeCells();  ///< of all values, as they travel
    const std::size_t size_;
    const CsvColumns columns_;
    const std::size_t longestLine_;
    std::vector<char> text_;
};

}  // namespace Varnholt::Cli
