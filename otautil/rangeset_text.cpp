#include <android-base/logging.h>

#include <algorithm>
#include <charconv>
#include <string_view>

#include "otautil/rangeset.h"

namespace {

// Numbers of the text form stay below 2^31, so that every reader can hold them.
constexpr size_t kLargestNumber = 2147483647;

// Blank, tab, newline, vertical tab, form feed and carriage return, in any locale.
bool is_white_space(char c) {
  return c == ' ' || (c >= '\t' && c <= '\r');
}

// Reads numbers separated by commas from a text, one after the other, without copying it.
class NumberReader {
 public:
  explicit NumberReader(std::string_view text)
      : cursor_(text.data()), end_(text.data() + text.size()) {}

  // Reads the next number with the comma behind it. Returns false if what stands up to there is
  // no number, or too large a one.
  bool read(size_t& value) {
    while (cursor_ != end_ && is_white_space(*cursor_)) {
      ++cursor_;
    }
    const auto [next, error] = read_digits(value);
    if (error != std::errc() || (next != end_ && *next != ',') || value > kLargestNumber) {
      return false;
    }
    cursor_ = next == end_ ? end_ : next + 1;
    return true;
  }

 private:
  std::from_chars_result read_digits(size_t& value) const {
    if (end_ - cursor_ > 1 && cursor_[0] == '0' && (cursor_[1] == 'x' || cursor_[1] == 'X')) {
      return std::from_chars(cursor_ + 2, end_, value, 16);
    }
    const bool has_plus = cursor_ != end_ && *cursor_ == '+';
    return std::from_chars(has_plus ? cursor_ + 1 : cursor_, end_, value);
  }

  const char* cursor_;
  const char* end_;
};

// Reads the first number. Returns 0, with an error logged, unless it is how many others follow.
size_t read_count(NumberReader& numbers, size_t following, const std::string& text) {
  size_t count = 0;
  if (!numbers.read(count)) {
    LOG(ERROR) << "Failed to parse the number of tokens: " << text;
    return 0;
  }
  if (count == 0) {
    LOG(ERROR) << "Invalid number of tokens: " << text;
    return 0;
  }
  if (count % 2 != 0) {
    LOG(ERROR) << "Number of tokens must be even: " << text;
    return 0;
  }
  if (count != following) {
    LOG(ERROR) << "Mismatching number of tokens: " << text;
    return 0;
  }
  return count;
}

}  // namespace

RangeSet RangeSet::Parse(const std::string& text) {
  const auto following = static_cast<size_t>(std::count(text.begin(), text.end(), ','));
  if (following < 2) {
    LOG(ERROR) << "Invalid range text: " << text;
    return {};
  }
  NumberReader numbers(text);
  std::vector<Range> ranges(read_count(numbers, following, text) / 2);
  for (auto& [start, end] : ranges) {
    if (!numbers.read(start) || !numbers.read(end)) {
      return {};
    }
  }
  return ranges.empty() ? RangeSet() : RangeSet(std::move(ranges));
}

std::string RangeSet::ToString() const {
  if (ranges_.empty()) {
    return "";
  }
  std::string text = std::to_string(2 * ranges_.size());
  for (const auto& [first, second] : ranges_) {
    text.append(",").append(std::to_string(first)).append(",").append(std::to_string(second));
  }
  return text;
}
