#include "otautil/rangeset.h"

#include <android-base/logging.h>

#include <algorithm>
#include <limits>

namespace {

// Adds a range's length to the number of blocks. Returns false, with an error logged, for a range
// that no set takes.
bool count_blocks(const RangeSet::Range& range, size_t& blocks) {
  const auto [first, second] = range;
  if (second <= first) {
    LOG(ERROR) << "Empty or negative range: " << first << ", " << second;
    return false;
  }
  const size_t length = second - first;
  if (blocks >= std::numeric_limits<size_t>::max() - length) {
    LOG(ERROR) << "RangeSet size overflow";
    return false;
  }
  blocks += length;
  return true;
}

}  // namespace

RangeSet::RangeSet(std::vector<Range>&& ranges) {
  if (ranges.empty()) {
    LOG(ERROR) << "Invalid number of tokens";
    return;
  }
  size_t blocks = 0;
  for (const Range& range : ranges) {
    if (!count_blocks(range, blocks)) {
      return;
    }
  }
  ranges_ = std::move(ranges);
  blocks_ = blocks;
}

bool RangeSet::PushBack(Range range) {
  if (!count_blocks(range, blocks_)) {
    return false;
  }
  ranges_.push_back(range);
  return true;
}

void RangeSet::Clear() {
  ranges_.clear();
  blocks_ = 0;
}

std::vector<RangeSet> RangeSet::Split(size_t groups) const {
  if (groups == 0 || ranges_.empty()) {
    return {};
  }
  groups = std::min(groups, blocks_);
  const size_t mean = blocks_ / groups;
  const size_t larger_groups = blocks_ % groups;
  std::vector<RangeSet> result(groups);
  auto range = ranges_.begin();
  size_t cursor = range->first;
  for (size_t i = 0; i < groups; ++i) {
    size_t wanted = i < larger_groups ? mean + 1 : mean;
    while (wanted > 0) {
      const size_t taken = std::min(wanted, range->second - cursor);
      result[i].PushBack({cursor, cursor + taken});
      wanted -= taken;
      cursor += taken;
      if (cursor == range->second && ++range != ranges_.end()) {
        cursor = range->first;
      }
    }
  }
  return result;
}

size_t RangeSet::GetBlockNumber(size_t idx) const {
  CHECK_LT(idx, blocks_) << "Out of bound index " << idx << " (total blocks: " << blocks_ << ")";
  size_t remaining = idx;
  for (const auto& [first, second] : ranges_) {
    if (remaining < second - first) {
      return first + remaining;
    }
    remaining -= second - first;
  }
  CHECK(false) << "Failed to find block number for index " << idx;
  return 0;
}

bool RangeSet::Overlaps(const RangeSet& other) const {
  for (const auto& [first, second] : ranges_) {
    for (const auto& [other_first, other_second] : other.ranges_) {
      if (other_first < second && first < other_second) {
        return true;
      }
    }
  }
  return false;
}

std::optional<RangeSet> RangeSet::GetSubRanges(size_t start_index, size_t num_of_blocks) const {
  if (start_index > blocks_ || num_of_blocks > blocks_ - start_index) {
    LOG(ERROR) << "Failed to get the sub ranges for start_index " << start_index
               << " num_of_blocks " << num_of_blocks
               << " total number of blocks the range contains is " << blocks_;
    return std::nullopt;
  }
  if (num_of_blocks == 0) {
    LOG(WARNING) << "num_of_blocks is zero when calling GetSubRanges()";
    return RangeSet();
  }
  RangeSet result;
  size_t to_skip = start_index;
  size_t to_take = num_of_blocks;
  for (const auto& [range_start, range_end] : ranges_) {
    CHECK_LT(range_start, range_end)
        << "range_start: " << range_start << " range_end: " << range_end;
    const size_t skipped = std::min(to_skip, range_end - range_start);
    const size_t first = range_start + skipped;
    const size_t taken = std::min(to_take, range_end - first);
    if (taken > 0 && !result.PushBack({first, first + taken})) {
      return std::nullopt;
    }
    to_skip -= skipped;
    to_take -= taken;
    if (to_take == 0) {
      return result;
    }
  }
  LOG(ERROR) << "Failed to construct byte ranges to read, start_block: " << start_index
             << ", num_of_blocks: " << num_of_blocks << " total number of blocks: " << blocks_;
  return std::nullopt;
}
