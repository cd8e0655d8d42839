#include "Output/Plot.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <ostream>
#include <vector>

namespace Varnholt::Cli {
namespace {

/// A raster of dots; row 0 is at the bottom.
class Raster final {
  public:
    Raster(int dotColumns, int dotRows)
        : columns(dotColumns), rows(dotRows), dots_(static_cast<std::size_t>(dotColumns * dotRows)) {}

    void Set(int column, int row) { dots_[IndexOf(column, row)] = true; }
    bool Get(int column, int row) const { return column < columns && dots_[IndexOf(column, row)]; }

    const int columns;
    const int rows;

  private:
    std::size_t IndexOf(int column, int row) const {
        return static_cast<std::size_t>(row * columns + column);
    }

    std::vector<bool> dots_;
};

constexpr int DotColumns = 2;  // of a Braille character
constexpr int DotRows = 4;

struct Scale {
    double low = std::numeric_limits<double>::infinity();
    double high = -std::numeric_limits<double>::infinity();

    void Take(double value) {
        low = std::min(low, value);
        high = std::max(high, value);
    }
    /// Room around values that are all the same, and an axis where there are none.
    void Settle() {
        if (low > high) {
            low = 0;
            high = 1;
        } else if (low == high) {
            const double room = low == 0 ? 1 : std::abs(low) / 2;
            low -= room;
            high += room;
        }
    }
    int RowOf(double value, int rows) const {
        const double part = value / (high - low) - low / (high - low);
        return std::clamp(static_cast<int>(std::lround(part * (rows - 1))), 0, rows - 1);
    }
};

/// Each column of dots stands for the values that fall into it; neighbouring columns are connected.
Raster Draw(std::span<const double> values, const Scale& scale, int columns, int rows) {
    Raster raster(columns, rows);
    int before = -1;
    for (int column = 0; column < columns; ++column) {
        const auto count = static_cast<std::int64_t>(values.size());
        const auto first = static_cast<std::size_t>(column * count / columns);
        const auto last = std::max(first + 1, static_cast<std::size_t>((column + 1) * count / columns));
        int lowest = rows;
        int highest = -1;
        int latest = -1;
        for (std::size_t i = first; i < std::min(last, values.size()); ++i) {
            if (!std::isfinite(values[i])) {
                continue;
            }
            latest = scale.RowOf(values[i], rows);
            lowest = std::min(lowest, latest);
            highest = std::max(highest, latest);
        }
        if (latest >= 0 && before >= 0) {
            // Up to the neighbour, which has its own dot.
            lowest = std::min(lowest, before + 1);
            highest = std::max(highest, before - 1);
        }
        for (int row = std::max(lowest, 0); latest >= 0 && row <= highest; ++row) {
            raster.Set(column, row);
        }
        before = latest;
    }
    return raster;
}

std::string BrailleCell(const Raster& raster, int column, int row) {
    // Bits of the eight dots, from the bottom up, left and right; the code points begin at U+2800.
    constexpr unsigned bits[DotRows][DotColumns] = {{0x40, 0x80}, {0x04, 0x20}, {0x02, 0x10}, {0x01, 0x08}};
    unsigned pattern = 0;
    for (int y = 0; y < DotRows; ++y) {
        for (int x = 0; x < DotColumns; ++x) {
            if (raster.Get(column * DotColumns + x, row * DotRows + y)) {
                pattern |= bits[y][x];
            }
        }
    }
    if (pattern == 0) {
        return " ";
    }
    return {static_cast<char>(0xE2), static_cast<char>(0xA0 | pattern >> 6),
            static_cast<char>(0x80 | (pattern & 0x3F))};
}

std::string Label(double value) {
    return fmt::format("{:.5g}", value);
}

}  // namespace

int PlotLines(const PlotStyle& style) {
    return std::max(style.height, 2) + 2;
}

void PrintPlot(std::ostream& stream, std::span<const double> values, const PlotStyle& style) {
    Scale scale;
    for (const double value : values) {
        if (std::isfinite(value)) {
            scale.Take(value);
        }
    }
    scale.Settle();
    const int height = std::max(style.height, 2);
    const std::string top = Label(scale.high);
    const int dotRows = height * (style.braille ? DotRows : 1);
    const int middleRow = height - 1 - height / 2;
    const double middleDot =
        middleRow * (style.braille ? DotRows : 1) + (style.braille ? DotRows - 1 : 0) / 2.0;
    const std::string middle = Label(scale.low + (scale.high - scale.low) * middleDot / (dotRows - 1));
    const std::string bottom = Label(scale.low);
    const bool hasMiddle = height > 2;
    const auto labelWidth =
        static_cast<int>(std::max({top.size(), hasMiddle ? middle.size() : 0, bottom.size()}));
    const int room = std::max(style.width - static_cast<int>(style.indent.size()) - labelWidth - 2, 1);
    const int perCell = style.braille ? DotColumns : 1;
    const auto count = static_cast<int>(std::min<std::size_t>(values.size(), 100000));
    const int width = std::clamp((count + perCell - 1) / perCell, 1, room);

    const int dotColumns = std::max(std::min(width * perCell, count), 1);
    const Raster raster = Draw(values, scale, dotColumns, dotRows);
    for (int line = 0; line < height; ++line) {
        const bool isLabelled = line == 0 || line == height - 1 || line == height / 2;
        const std::string& label = line == 0 ? top : line == height - 1 ? bottom : middle;
        std::string text = fmt::format("{}{:>{}} {}", style.indent, isLabelled ? label : "", labelWidth,
                                       style.braille ? (isLabelled ? "┤" : "│") : (isLabelled ? "+" : "|"));
        const int row = height - 1 - line;
        for (int column = 0; column < width; ++column) {
            text += style.braille ? BrailleCell(raster, column, row) : raster.Get(column, row) ? "*" : " ";
        }
        text.erase(text.find_last_not_of(' ') + 1);
        stream << text << '\n';
    }

    std::string axis = style.indent + std::string(static_cast<std::size_t>(labelWidth) + 1, ' ');
    axis += style.braille ? "└" : "+";
    std::string labels(style.indent.size() + static_cast<std::size_t>(labelWidth) + 2, ' ');
    constexpr int labelEvery = 16;
    for (int column = 0; column < width; ++column) {
        const bool isLabelled = column % labelEvery == 0;
        axis += style.braille ? (isLabelled ? "┬" : "─") : (isLabelled ? "+" : "-");
        if (isLabelled) {
            const std::string index = std::to_string(static_cast<std::int64_t>(column) * count / width);
            const std::size_t at = style.indent.size() + static_cast<std::size_t>(labelWidth) + 2 +
                                   static_cast<std::size_t>(column);
            if (column == 0 || at + index.size() <= static_cast<std::size_t>(std::max(style.width, 0))) {
                labels.resize(std::max(labels.size(), at), ' ');
                labels += index;
            }
        }
    }
    stream << axis << '\n' << labels << '\n';
}

}  // namespace Varnholt::Cli
