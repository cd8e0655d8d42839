#include "Output/Plot.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <ostream>
#include <vector>

namespace Varnholt::Cli {
namespace {

/// Rows of dots, from the bottom up.
using Raster = std::vector<std::vector<bool>>;

constexpr int DotColumns = 2;  // of a Braille character
constexpr int DotRows = 4;

struct Scale {
    double low, high;

    int RowOf(double value, int rows) const {
        const double part = value / (high - low) - low / (high - low);
        return std::clamp(static_cast<int>(std::lround(part * (rows - 1))), 0, rows - 1);
    }
};

/// Each column of dots stands for the values that fall into it; neighbouring columns are connected.
Raster Draw(std::span<const double> values, const Scale& scale, int columns, int rows) {
    Raster raster(static_cast<std::size_t>(rows), std::vector<bool>(static_cast<std::size_t>(columns)));
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
            raster[static_cast<std::size_t>(row)][static_cast<std::size_t>(column)] = true;
        }
        before = latest;
    }
    return raster;
}

bool HasDot(const Raster& raster, int column, int row) {
    const std::vector<bool>& dots = raster[static_cast<std::size_t>(row)];
    const auto place = static_cast<std::size_t>(column);
    return place < dots.size() && dots[place];
}

std::string BrailleCell(const Raster& raster, int column, int row) {
    // Bits of the eight dots, from the bottom up, left and right; the code points begin at U+2800.
    constexpr unsigned bits[DotRows][DotColumns] = {{0x40, 0x80}, {0x04, 0x20}, {0x02, 0x10}, {0x01, 0x08}};
    unsigned pattern = 0;
    for (int y = 0; y < DotRows; ++y) {
        for (int x = 0; x < DotColumns; ++x) {
            if (HasDot(raster, column * DotColumns + x, row * DotRows + y)) {
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

/// Room around values that are all the same, and an axis where there are none.
Scale ScaleOf(std::span<const double> values) {
    std::vector<double> finite(values.begin(), values.end());
    std::erase_if(finite, [](double value) { return !std::isfinite(value); });
    if (finite.empty()) {
        return {0, 1};
    }
    const double low = std::ranges::min(finite);
    const double high = std::ranges::max(finite);
    if (low < high) {
        return {low, high};
    }
    const double room = low == 0 ? 1 : std::abs(low) / 2;
    return {low - room, high + room};
}

int HeightOf(const PlotStyle& style) {
    return std::max(style.height, 2);
}

/// Of the three lines that have one: top, bottom, and the value in the middle of the line between.
std::vector<std::string> LabelsOf(const Scale& scale, int height, int rowsOfLine) {
    std::vector<std::string> labels(static_cast<std::size_t>(height));
    const int lineAbove = height - 1 - height / 2;  // from the bottom
    const double dot = lineAbove * rowsOfLine + (rowsOfLine - 1) / 2.0;
    const double middle = scale.low + (scale.high - scale.low) * dot / (height * rowsOfLine - 1);
    labels[static_cast<std::size_t>(height / 2)] = fmt::format("{:.5g}", middle);
    labels.front() = fmt::format("{:.5g}", scale.high);
    labels.back() = fmt::format("{:.5g}", scale.low);
    return labels;
}

/// Under `width` columns that stand for `count` values, behind labels of some width.
void PrintAxis(std::ostream& stream, const PlotStyle& style, int labelWidth, int width, int count) {
    constexpr int labelEvery = 16;
    const std::size_t begin = style.indent.size() + static_cast<std::size_t>(labelWidth) + 2;
    std::string axis = fmt::format("{}{:>{}}{}", style.indent, "", labelWidth + 1, style.braille ? "└" : "+");
    std::string labels(begin, ' ');
    for (int column = 0; column < width; ++column) {
        const bool isLabelled = column % labelEvery == 0;
        axis += style.braille ? (isLabelled ? "┬" : "─") : (isLabelled ? "+" : "-");
        const std::string index = std::to_string(static_cast<std::int64_t>(column) * count / width);
        const std::size_t at = begin + static_cast<std::size_t>(column);
        const bool fits = at + index.size() <= static_cast<std::size_t>(std::max(style.width, 0));
        if (isLabelled && (column == 0 || fits)) {
            labels.resize(std::max(labels.size(), at), ' ');
            labels += index;
        }
    }
    stream << axis << '\n' << labels << '\n';
}

}  // namespace

int PlotLines(const PlotStyle& style) {
    return HeightOf(style) + 2;
}

void PrintPlot(std::ostream& stream, std::span<const double> values, const PlotStyle& style) {
    const Scale scale = ScaleOf(values);
    const int height = HeightOf(style);
    const int columnDots = style.braille ? DotColumns : 1;
    const int rowDots = style.braille ? DotRows : 1;
    const std::vector<std::string> labels = LabelsOf(scale, height, rowDots);
    const auto labelWidth =
        static_cast<int>(std::ranges::max_element(labels, {}, &std::string::size)->size());
    const int count = static_cast<int>(std::min<std::size_t>(values.size(), 100000));
    const int room = style.width - static_cast<int>(style.indent.size()) - labelWidth - 2;
    const int width = std::clamp((count + columnDots - 1) / columnDots, 1, std::max(room, 1));
    const Raster raster =
        Draw(values, scale, std::max(std::min(width * columnDots, count), 1), height * rowDots);
    for (int line = 0; line < height; ++line) {
        const std::string& label = labels[static_cast<std::size_t>(line)];
        std::string text =
            fmt::format("{}{:>{}} {}", style.indent, label, labelWidth,
                        style.braille ? (label.empty() ? "│" : "┤") : (label.empty() ? "|" : "+"));
        const int row = height - 1 - line;
        for (int column = 0; column < width; ++column) {
            text += style.braille                 ? BrailleCell(raster, column, row)
                    : HasDot(raster, column, row) ? "*"
                                                  : " ";
        }
        text.erase(text.find_last_not_of(' ') + 1);
        stream << text << '\n';
    }
    PrintAxis(stream, style, labelWidth, width, count);
}

}  // namespace Varnholt::Cli
