#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace sentrova {

// Rows of cells under a heading, which all have the heading's number of cells. Cells are made
// printable (printable.h) and so have neither tabs nor line ends.
class Table {
 public:
  explicit Table(std::vector<std::string> heading);

  void add_row(const std::vector<std::string>& cells);

  // The heading and the rows in columns. No line is wider than `width` columns: the widest cells
  // lose their beginning. Only below some four columns a cell a line may be wider. Empty without
  // rows.
  std::string aligned(size_t width) const;

  // The rows alone, cells parted by tabs, for programs.
  std::string tab_separated() const;

 private:
  std::vector<size_t> column_widths(size_t width) const;

  std::vector<std::vector<std::string>> rows_;  // the heading first
};

}  // namespace sentrova
