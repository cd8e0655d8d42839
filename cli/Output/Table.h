#pragma once

#include <iosfwd>
#include <string>
#include <vector>

namespace Varnholt::Cli {

/// Text in columns, each as wide as its widest cell. Numbers go to the right, everything else to the left.
class Table final {
  public:
    enum class Align { Left, Right };
    struct Column {
        std::string title;  ///< a table whose titles are all empty has no head
        Align align = Align::Left;
    };

    explicit Table(std::vector<Column> tableColumns) : columns_(std::move(tableColumns)) {}

    /// Missing cells are empty; cells beyond the columns are dropped.
    void AddRow(std::vector<std::string> cells);
    bool IsEmpty() const { return rows_.empty(); }
    /// No line ends with blanks.
    void Print(std::ostream& stream) const;

  private:
    const std::vector<Column> columns_;
    std::vector<std::vector<std::string>> rows_;
};

}  // namespace Varnholt::Cli
