#pragma once

#include <stddef.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "common/export.h"

// Sets of blocks of a block device, as lists of ranges.
//
// Block numbers and counts are in blocks; a range is a half-open interval [first, second) of block
// numbers. Errors go to the base log at severity error. A broken precondition is a fatal check: one
// line "Check failed: " with the condition and the reason, and the process aborts. Sets are values;
// one set may be read on several threads while none changes it.

// Block ranges in the order in which they were added, which may overlap or touch, and the number of
// blocks in them. The set without ranges is invalid: it tests false and is the result of every
// failure.
class RangeSet {
 public:
  using Range = std::pair<size_t, size_t>;
  using const_iterator = std::vector<Range>::const_iterator;

  RangeSet() = default;

  // Adds the ranges in order, as PushBack does. No range at all ("Invalid number of tokens") or one
  // that PushBack refuses leaves the set empty.
  SENTROVA_API explicit RangeSet(std::vector<Range>&& ranges);

  // Appends a range. Returns false, with an error logged and the set unchanged, for an empty or
  // reversed range and for one with which the number of blocks would reach the largest size_t.
  SENTROVA_API bool PushBack(Range range);

  // Removes all ranges.
  SENTROVA_API void Clear();

  // Reads the text form: decimal numbers separated by commas, first how many numbers follow, then
  // start and end of each range ("4,10,20,30,40" is [10,20) and [30,40)). A number may follow white
  // space and a plus sign, or be hexadecimal with the prefix 0x or 0X; it is below 2^31, and
  // nothing may stand behind it. Returns the empty set on any error: a wrong count and a refused
  // range are logged, an unreadable start or end is not.
  SENTROVA_API static RangeSet Parse(const std::string& text);

  // Returns the text form, without blanks; the empty string for the empty set. Parse reads it back
  // if its numbers are below 2^31.
  SENTROVA_API std::string ToString() const;

  // Cuts the blocks, in order, into `groups` sets, or into one set a block if there are fewer
  // blocks. The sizes differ by at most one block, larger ones first. Returns nothing for 0 groups
  // and for the empty set.
  SENTROVA_API std::vector<RangeSet> Split(size_t groups) const;

  // Returns the number of the block at the index `idx`, counted over all ranges in order. An index
  // that is not below blocks() is a fatal check.
  SENTROVA_API size_t GetBlockNumber(size_t idx) const;

  // Returns whether some block is in both sets. Compares each range with each: for short sets.
  SENTROVA_API bool Overlaps(const RangeSet& other) const;

  // Returns the blocks with the indices from `start_index` on, `num_of_blocks` of them, as a set.
  // No blocks give an empty set, with a warning logged. Indices past the end give no value, with an
  // error logged.
  SENTROVA_API std::optional<RangeSet> GetSubRanges(size_t start_index, size_t num_of_blocks) const;

  // The number of blocks, which counts a block once for each range that holds it.
  size_t blocks() const { return blocks_; }

  // The ranges: how many, each by its index below size(), and in order.
  size_t size() const { return ranges_.size(); }
  const Range& operator[](size_t index) const { return ranges_[index]; }
  const_iterator begin() const { return ranges_.begin(); }
  const_iterator end() const { return ranges_.end(); }
  const_iterator cbegin() const { return ranges_.cbegin(); }
  const_iterator cend() const { return ranges_.cend(); }

  explicit operator bool() const { return !ranges_.empty(); }

  // Equal sets have the same ranges in the same order.
  bool operator==(const RangeSet& other) const { return ranges_ == other.ranges_; }

 protected:
  std::vector<Range> ranges_;
  size_t blocks_ = 0;
};

// A set whose ranges are sorted by start and end; after an Insert they are also disjoint and do not
// touch. It takes byte ranges of the device as well, in blocks of 4096 bytes. Appending to it with
// PushBack breaks the order until the next Insert.
class SortedRangeSet : public RangeSet {
 public:
  SortedRangeSet() = default;

  // As RangeSet's, then sorted, but not merged.
  SENTROVA_API explicit SortedRangeSet(std::vector<Range>&& ranges);

  // Adds a range and merges what overlaps or touches. A range that PushBack refuses is logged and
  // changes nothing.
  SENTROVA_API void Insert(const Range& range);

  // Adds all ranges of another set, which may be this one, and merges likewise. An empty set
  // changes nothing. Takes about as long as sorting the ranges of both.
  SENTROVA_API void Insert(const SortedRangeSet& other);

  // Adds every block that the `length` bytes from the byte `start` on touch. Bytes that are none,
  // or that run past the largest size_t, are refused as an empty range.
  SENTROVA_API void Insert(size_t start, size_t length);

  using RangeSet::Overlaps;

  // Returns whether the set holds a block that these bytes touch; see Insert.
  SENTROVA_API bool Overlaps(size_t start, size_t length) const;

  // Returns where the device's byte `old_offset` stands among the bytes of the set's blocks, one
  // range behind the other. A byte whose block is not in the set is a fatal check.
  SENTROVA_API size_t GetOffsetInRangeSet(size_t old_offset) const;
};
