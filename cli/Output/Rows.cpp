#include "Output/Rows.h"

#include <algorithm>

namespace Varnholt::Cli {
namespace {

constexpr std::size_t Gap = 2;

/// Characters, as far as they are one column wide: bytes that do not continue a UTF-8 sequence.
std::size_t WidthOf(const std::string& text) {
    return static_cast<std::size_t>(
        std::ranges::count_if(text, [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80U; }));
}

}  // namespace

void Rows::Add(std::vector<Cell> cells) {
    cells.resize(columns_.size(), Cell("", std::nullopt));
    std::vector<std::string>& row = rows_.emplace_back();
    Json object = Json::Object();
    for (std::size_t i = 0; i < cells.size(); ++i) {
        if (columns_[i].member != nullptr && cells[i].value) {
            object.Add(columns_[i].member, *cells[i].value);
        }
        row.push_back(std::move(cells[i].text));
    }
    array_.Append(object);
}

std::string Rows::Text() const {
    std::vector<std::vector<std::string>> lines;
    if (std::ranges::any_of(columns_, [](const Column& column) { return !column.title.empty(); })) {
        std::ranges::transform(columns_, std::back_inserter(lines.emplace_back()), &Column::title);
    }
    lines.insert(lines.end(), rows_.begin(), rows_.end());
    std::vector<std::size_t> widths(columns_.size());
    for (const auto& line : lines) {
        std::ranges::transform(line, widths, widths.begin(), [](const std::string& cell, std::size_t width) {
            return std::max(width, WidthOf(cell));
        });
    }
    std::string text;
    for (const auto& line : lines) {
        for (std::size_t i = 0; i < columns_.size(); ++i) {
            const std::string padding(widths[i] - WidthOf(line[i]), ' ');
            if (columns_[i].align != Hidden) {
                text += columns_[i].align == Right ? padding + line[i] : line[i] + padding;
                text.append(Gap, ' ');
            }
        }
        text.erase(text.find_last_not_of(' ') + 1);
        text += '\n';
    }
    return text;
}

}  // namespace Varnholt::Cli
