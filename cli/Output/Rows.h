#pragma once

#include <optional>

#include "Output/Json.h"

namespace Varnholt::Cli {

/// Rows of a result, described once: a table for people, and for programs an array with an object for each
/// row.
class Rows final {
  public:
    /// Numbers stand at the right of their column, and everything else at the left.
    enum Align { Left, Right, Hidden };
    struct Column {
        std::string title;             ///< a table whose titles are all empty has no head
        const char* member = nullptr;  ///< of the objects; null: the column is in the table only
        Align align = Left;            ///< `Hidden`: it is in the objects only
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

    explicit Rows(std::vector<Column> rowColumns) : columns_(std::move(rowColumns)) {}

    /// Missing cells are empty, and in no object.
    void Add(std::vector<Cell> cells);
    bool IsEmpty() const { return rows_.empty(); }
    /// The table: each column as wide as its widest cell, and no line that ends with blanks.
    std::string Text() const;
    const Json& AsJson() const { return array_; }

  private:
    const std::vector<Column> columns_;
    std::vector<std::vector<std::string>> rows_;
    Json array_ = Json::Array();
};

}  // namespace Varnholt::Cli
