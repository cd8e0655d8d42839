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
        return static_cast<std::size_t>(row) * static_cast<std::size_t>(columns) +
               static_cast<std::size_t>(column);
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

/// What a plot needs to know before its first line is printed.
class Plot final {
  public:
    Plot(std::span<const double> values, const PlotStyle& style);

    void PrintLines(std::ostream& stream) const;
    void PrintAxis(std::ostream& stream) const;

  private:
    static Scale ScaleOf(std::span<const double> values);

    const PlotStyle& style_;
    const Scale scale_;
    const int height_;  ///< lines
    const int dotRows_;
    const std::string top_, middle_, bottom_;  ///< labels
    const int labelWidth_;
    const int count_;  ///< values
    const int width_;  ///< columns
    const Raster raster_;
};

Scale Plot::ScaleOf(std::span<const double> values) {
    Scale scale;
    for (const double value : values) {
        if (std::isfinite(value)) {
            scale.Take(value);
        }
    }
    scale.Settle();
    return scale;
}

int HeightOf(const PlotStyle& style) {
    return std::max(style.height, 2);
}

/// The value in the middle of the labelled line.
std::string MiddleLabel(const Scale& scale, int height, bool braille) {
    const int rowsOfLine = braille ? DotRows : 1;
    const int line = height - 1 - height / 2;  // from the bottom
    const double dot = line * rowsOfLine + (rowsOfLine - 1) / 2.0;
    return Label(scale.low + (scale.high - scale.low) * dot / (height * rowsOfLine - 1));
}

int WidthOfLabels(std::initializer_list<std::size_t> widths) {
    return static_cast<int>(std::max(widths));
}

Plot::Plot(std::span<const double> values, const PlotStyle& style)
    : style_(style),
      scale_(ScaleOf(values)),
      height_(HeightOf(style)),
      dotRows_(height_ * (style.braille ? DotRows : 1)),
      top_(Label(scale_.high)),
      middle_(height_ > 2 ? MiddleLabel(scale_, height_, style.braille) : ""),
      bottom_(Label(scale_.low)),
      labelWidth_(WidthOfLabels({top_.size(), middle_.size(), bottom_.size()})),
      count_(static_cast<int>(std::min<std::size_t>(values.size(), 100000))),
      width_(std::clamp(style.braille ? (count_ + DotColumns - 1) / DotColumns : count_, 1,
                        std::max(style.width - static_cast<int>(style.indent.size()) - labelWidth_ - 2, 1))),
      raster_(Draw(values, scale_, std::max(std::min(width_ * (style.braille ? DotColumns : 1), count_), 1),
                   dotRows_)) {}

void Plot::PrintLines(std::ostream& stream) const {
    for (int line = 0; line < height_; ++line) {
        const bool isLabelled = line == 0 || line == height_ - 1 || line == height_ / 2;
        const std::string& label = line == 0 ? top_ : line == height_ - 1 ? bottom_ : middle_;
        std::string text = fmt::format("{}{:>{}} {}", style_.indent, isLabelled ? label : "", labelWidth_,
                                       style_.braille ? (isLabelled ? "┤" : "│") : (isLabelled ? "+" : "|"));
        const int row = height_ - 1 - line;
        for (int column = 0; column < width_; ++column) {
            text += style_.braille ? BrailleCell(raster_, column, row) : raster_.Get(column, row) ? "*" : " ";
        }
        text.erase(text.find_last_not_of(' ') + 1);
        stream << text << '\n';
    }
}

void Plot::PrintAxis(std::ostream& stream) const {
    constexpr int labelEvery = 16;
    const std::size_t begin = style_.indent.size() + static_cast<std::size_t>(labelWidth_) + 2;
    std::string axis =
        fmt::format("{}{:>{}}{}", style_.indent, "", labelWidth_ + 1, style_.braille ? "└" : "+");
    std::string labels(begin, ' ');
    for (int column = 0; column < width_; ++column) {
        const bool isLabelled = column % labelEvery == 0;
        axis += style_.braille ? (isLabelled ? "┬" : "─") : (isLabelled ? "+" : "-");
        const std::string index = std::to_string(static_cast<std::int64_t>(column) * count_ / width_);
        const std::size_t at = begin + static_cast<std::size_t>(column);
        const bool fits = at + index.size() <= static_cast<std::size_t>(std::max(style_.width, 0));
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
    const Plot plot(values, style);
    plot.PrintLines(stream);
    plot.PrintAxis(stream);
}

}  // namespace Varnholt::Cli
