#include <android-base/logging.h>

#include <algorithm>

#include "otautil/rangeset.h"

namespace {

constexpr int kBlockShift = 12;
constexpr size_t kOffsetMask = (size_t{1} << kBlockShift) - 1;

// The blocks that a byte range touches; an empty range for bytes that cannot be.
RangeSet::Range touched_blocks(size_t start, size_t length) {
  const size_t first = start >> kBlockShift;
  size_t last_byte = 0;
  if (length == 0 || __builtin_add_overflow(start, length - 1, &last_byte)) {
    return {first, first};
  }
  return {first, (last_byte >> kBlockShift) + 1};
}

}  // namespace

SortedRangeSet::SortedRangeSet(std::vector<Range>&& ranges) : RangeSet(std::move(ranges)) {
  std::sort(ranges_.begin(), ranges_.end());
}

void SortedRangeSet::Insert(const Range& range) {
  Insert(SortedRangeSet(std::vector<Range>{range}));
}

void SortedRangeSet::Insert(const SortedRangeSet& other) {
  if (!other) {
    return;
  }
  std::vector<Range> all;
  all.reserve(ranges_.size() + other.ranges_.size());
  all.insert(all.end(), ranges_.begin(), ranges_.end());
  all.insert(all.end(), other.ranges_.begin(), other.ranges_.end());
  std::sort(all.begin(), all.end());
  Clear();
  const auto store = [this](const Range& range) {
    ranges_.push_back(range);
    blocks_ += range.second - range.first;
  };
  Range current = all.front();
  for (const Range& next : all) {
    if (next.first > current.second) {
      store(current);
      current = next;
    } else {
      current.second = std::max(current.second, next.second);
    }
  }
  store(current);
}

void SortedRangeSet::Insert(size_t start, size_t length) {
  Insert(touched_blocks(start, length));
}

bool SortedRangeSet::Overlaps(size_t start, size_t length) const {
  return Overlaps(RangeSet({touched_blocks(start, length)}));
}

size_t SortedRangeSet::GetOffsetInRangeSet(size_t old_offset) const {
  const size_t block = old_offset >> kBlockShift;
  size_t blocks_before = 0;
  for (const auto& [first, second] : ranges_) {
    if (block < second) {
      CHECK_GE(block, first) << "block_start " << block
                             << " is missing between two ranges: " << ToString();
      return ((blocks_before + block - first) << kBlockShift) | (old_offset & kOffsetMask);
    }
    blocks_before += second - first;
  }
  CHECK(false) << "block_start " << block
               << " exceeds the limit of current RangeSet: " << ToString();
  return 0;
}
