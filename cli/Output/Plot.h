#pragma once

#include <iosfwd>
#include <span>
#include <string>

namespace Varnholt::Cli {

/// How a plot is drawn.
struct PlotStyle {
    bool braille = true;  ///< 2 x 4 dots in each character; otherwise one ASCII character for each value
    int width = 80;       ///< columns of the whole plot, labels included
    int height = 12;      ///< lines of the plotting area
    std::string indent;   ///< before each line
};

/// Draws the values as a line over their index, scaled to fit, with labels on both axes. Values that are no
/// numbers leave a gap. Always `height` + 2 lines, and no wider than `width` from 20 columns on, so that a
/// plot can be drawn over an earlier one.
void PrintPlot(std::ostream& stream, std::span<const double> values, const PlotStyle& style);

/// Lines that `PrintPlot` prints.
int PlotLines(const PlotStyle& style);

}  // namespace Varnholt::Cli
