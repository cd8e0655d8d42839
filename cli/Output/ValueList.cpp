#include "Output/ValueList.h"

#include <fmt/format.h>
#include <fmt/ostream.h>

#include <algorithm>

#include "Service/Memory/PropertyText.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

using DeviceDriver::Generic::Configuration::Properties;

constexpr int PlotHeight = 8;
constexpr std::size_t NumbersInARow = 8;

void PrintNumbers(std::ostream& out, const std::vector<double>& numbers) {
    for (std::size_t row = 0; row < numbers.size(); row += NumbersInARow) {
        fmt::print(out, "{:>5}:", row);
        for (std::size_t i = row; i < std::min(row + NumbersInARow, numbers.size()); ++i) {
            fmt::print(out, " {:>10}", numbers[i]);
        }
        out << '\n';
    }
}

}  // namespace

Rows::Cell CellOf(const Property& value) {
    return {TextOf(value), Json(value)};
}

Rows::Cell CellOfWord(std::uint32_t word) {
    return {fmt::format("0x{:08X}", word), Json(word)};
}

void PrintValues(Session& session, const Properties& values, Vectors vectors) {
    Rows table({{"ID", nullptr, Rows::Right}, {"VALUE"}});
    for (const auto& [id, value] : values.GetDatastore()) {
        table.Add({id, IsLongVector(value) ? fmt::format("{} elements, below", NumbersOf(value).size())
                                           : TextOf(value)});
    }
    session.Out() << table.Text();
    for (const auto& [id, value] : values.GetDatastore()) {
        if (!IsLongVector(value)) {
            continue;
        }
        const std::vector<double> numbers = NumbersOf(value);
        fmt::print(session.Out(), "\n{}:\n", id);
        if (vectors == Vectors::Numbers) {
            PrintNumbers(session.Out(), numbers);
        } else if (std::all_of(numbers.begin(), numbers.end(),
                               [&numbers](double number) { return number == numbers.front(); })) {
            fmt::print(session.Out(), "  all {} elements are {}\n", numbers.size(), numbers.front());
        } else {
            PlotStyle style = session.StyleOfPlots();
            style.height = PlotHeight;
            style.indent = "  ";
            PrintPlot(session.Out(), numbers, style);
        }
    }
}

}  // namespace Varnholt::Cli
