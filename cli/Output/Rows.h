#pragma once

#include <optional>

#include "Output/Json.h"
#include "Output/Table.h"

namespace Varnholt::Cli {

/// Rows of a result, described once: a table for people, and for programs an array with an object for each
/// row.
class Rows final {
  public:
    struct Column {
        std::string title;             ///< of the table
        const char* member = nullptr;  ///< of the objects; null: the column is in the table only
        Table::Align align = Table::Align::Left;
        bool isShown = true;  ///< in the table
    };
    /// What stands in both; another value, or none, may stand in the object.
    struct Cell {
        Cell(std::string shownText) : text(std::move(shownText)), value(text) {}
        Cell(const char* shownText) : Cell(std::string(shownText)) {}
        template <std::integral Number>
        Cell(Number number) : text(std::to_string(number)), value(number) {}
        Cell(std::string shownText, std::optional<Json> objectValue)
            : text(std::move(shownText)), value(std::move(objectValue)) {}

        std::string text;
        std::optional<Json> value;
    };

    explicit Rows(std::vector<Column> rowColumns);

    void Add(const std::vector<Cell>& cells);
    bool IsEmpty() const { return table_.IsEmpty(); }
    void Print(std::ostream& stream) const { table_.Print(stream); }
    const Json& AsJson() const { return array_; }

  private:
    const std::vector<Column> columns_;
    Table table_;
    Json array_{Json::Array()};
};

}  // namespace Varnholt::Cli
