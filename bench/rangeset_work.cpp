// What bench/rangeset times. Exits with 1 if a limit is exceeded, with 2 if a result is wrong.
#include <charconv>
#include <cstdlib>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "bench/side_by_side.h"
#include "otautil/rangeset.h"

namespace {

using Ranges = std::vector<RangeSet::Range>;

constexpr size_t kRanges = 100'000;
constexpr double kParseLimit = 2.0;
constexpr double kInsertLimit = 1.5;

void expect(bool is_right) {
  if (!is_right) {
    std::puts("wrong result");
    std::exit(2);
  }
}

// Ranges of up to 100 blocks with gaps between them, from everywhere below 2^31, in random order.
Ranges scattered_ranges(unsigned seed) {
  std::mt19937 random(seed);
  Ranges ranges;
  for (size_t i = 0; i < kRanges; ++i) {
    const size_t start = i * 20'000 + random() % 10'000;
    ranges.push_back({start, start + 1 + random() % 100});
  }
  std::shuffle(ranges.begin(), ranges.end(), random);
  return ranges;
}

bool compare_parse() {
  const std::string text = RangeSet(scattered_ranges(1)).ToString();
  const auto ours = [&] { expect(RangeSet::Parse(text).size() == kRanges); };
  const auto bare = [&] {
    std::vector<size_t> numbers;
    numbers.reserve(2 * kRanges + 1);
    for (const char* next = text.data(); next < text.data() + text.size(); ++next) {
      size_t number = 0;
      next = std::from_chars(next, text.data() + text.size(), number).ptr;
      numbers.push_back(number);
    }
    expect(numbers.size() == 2 * kRanges + 1);
  };
  return side_by_side::compare("parse 100,000 ranges", kParseLimit, ours, bare);
}

// Against a sort of what the insertion has to bring together.
bool compare_insert() {
  const SortedRangeSet first(scattered_ranges(2));
  const SortedRangeSet second(scattered_ranges(3));
  Ranges both(first.begin(), first.end());
  both.insert(both.end(), second.begin(), second.end());
  SortedRangeSet set;
  Ranges sorted;
  const auto ours = [&] {
    set = first;
    set.Insert(second);
    expect(set.size() > kRanges);
  };
  const auto bare = [&] {
    sorted = both;
    std::sort(sorted.begin(), sorted.end());
    expect(sorted.size() == 2 * kRanges);
  };
  return side_by_side::compare("insert 100,000 into 100,000", kInsertLimit, ours, bare);
}

}  // namespace

int main() {
  const bool parse_is_fast = compare_parse();
  return compare_insert() && parse_is_fast ? 0 : 1;
}
