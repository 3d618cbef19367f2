#include "cli/table.h"

#include <android-base/strings.h>

#include <algorithm>
#include <numeric>
#include <utility>

#include "cli/printable.h"

namespace sentrova {
namespace {

constexpr size_t kGap = 2;
constexpr size_t kLeastWidth = 4;  // of a column that is made narrower

}  // namespace

Table::Table(std::vector<std::string> heading) : rows_({std::move(heading)}) {}

void Table::add_row(const std::vector<std::string>& cells) {
  std::vector<std::string>& row = rows_.emplace_back();
  std::transform(cells.begin(), cells.end(), std::back_inserter(row), printable);
}

// Takes from the widest column until the line fits.
std::vector<size_t> Table::column_widths(size_t width) const {
  std::vector<size_t> widths(rows_.front().size());
  for (const auto& row : rows_) {
    for (size_t i = 0; i < row.size(); ++i) {
      widths[i] = std::max(widths[i], display_width(row[i]));
    }
  }
  size_t total = std::accumulate(widths.begin(), widths.end(), kGap * (widths.size() - 1));
  while (total > width) {
    size_t& widest = *std::max_element(widths.begin(), widths.end());
    if (widest <= kLeastWidth) {
      break;
    }
    --widest;
    --total;
  }
  return widths;
}

std::string Table::aligned(size_t width) const {
  if (rows_.size() == 1) {
    return "";
  }
  const std::vector<size_t> widths = column_widths(width);
  std::vector<std::string> lines;
  for (const auto& row : rows_) {
    std::string line;
    size_t blanks = 0;
    for (size_t i = 0; i < row.size(); ++i) {
      const std::string cell = shortened(row[i], widths[i]);
      if (!cell.empty()) {  // blanks only before something
        line += std::string(blanks, ' ') + cell;
        blanks = 0;
      }
      blanks += widths[i] - display_width(cell) + kGap;
    }
    lines.push_back(line);
  }
  return android::base::Join(lines, '\n');
}

std::string Table::tab_separated() const {
  std::vector<std::string> lines;
  for (size_t i = 1; i < rows_.size(); ++i) {
    lines.push_back(android::base::Join(rows_[i], '\t'));
  }
  return android::base::Join(lines, '\n');
}

}  // namespace sentrova
