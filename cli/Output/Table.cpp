#include "Output/Table.h"

#include <algorithm>
#include <ostream>

namespace Varnholt::Cli {
namespace {

constexpr std::size_t Gap = 2;

/// Characters, as far as they are one column wide: bytes that do not continue a UTF-8 sequence.
std::size_t WidthOf(const std::string& text) {
    return static_cast<std::size_t>(std::count_if(
        text.begin(), text.end(), [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80U; }));
}

}  // namespace

void Table::AddRow(std::vector<std::string> cells) {
    cells.resize(columns_.size());
    rows_.push_back(std::move(cells));
}

void Table::Print(std::ostream& stream) const {
    std::vector<std::size_t> widths;
    std::vector<std::string> titles;
    bool hasHead = false;
    for (const Column& column : columns_) {
        widths.push_back(WidthOf(column.title));
        titles.push_back(column.title);
        hasHead = hasHead || !column.title.empty();
    }
    for (const auto& row : rows_) {
        for (std::size_t i = 0; i < row.size(); ++i) {
            widths[i] = std::max(widths[i], WidthOf(row[i]));
        }
    }
    const auto printRow = [&](const std::vector<std::string>& cells) {
        std::string line;
        for (std::size_t i = 0; i < cells.size(); ++i) {
            const std::string padding(widths[i] - WidthOf(cells[i]), ' ');
            line += columns_[i].align == Align::Right ? padding + cells[i] : cells[i] + padding;
            line.append(Gap, ' ');
        }
        line.erase(line.find_last_not_of(' ') + 1);
        stream << line << '\n';
    };
    if (hasHead) {
        printRow(titles);
    }
    for (const auto& row : rows_) {
        printRow(row);
    }
}

}  // namespace Varnholt::Cli
