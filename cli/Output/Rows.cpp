#include "Output/Rows.h"

namespace Varnholt::Cli {
namespace {

std::vector<Table::Column> ShownOf(const std::vector<Rows::Column>& columns) {
    std::vector<Table::Column> shown;
    for (const Rows::Column& column : columns) {
        if (column.isShown) {
            shown.push_back({column.title, column.align});
        }
    }
    return shown;
}

}  // namespace

Rows::Rows(std::vector<Column> rowColumns) : columns_(std::move(rowColumns)), table_(ShownOf(columns_)) {}

void Rows::Add(const std::vector<Cell>& cells) {
    std::vector<std::string> shown;
    Json object{Json::Object()};
    for (std::size_t i = 0; i < columns_.size(); ++i) {
        const Column& column = columns_[i];
        if (column.isShown) {
            shown.push_back(cells.at(i).text);
        }
        if (column.member != nullptr && cells.at(i).value) {
            object.Add(column.member, *cells[i].value);
        }
    }
    table_.AddRow(std::move(shown));
    array_.Append(std::move(object));
}

}  // namespace Varnholt::Cli
