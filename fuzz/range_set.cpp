// The text form of block ranges: whatever is taken is written and read back to the same set, and is
// cut, searched and merged without losing a block.
#include <android-base/logging.h>

#include <string>
#include <vector>

#include "fuzz/fuzz_target.h"
#include "otautil/rangeset.h"

namespace {

void check_parts(const RangeSet& set) {
  size_t blocks = 0;
  for (const RangeSet& group : set.Split(3)) {
    CHECK(!!group);
    blocks += group.blocks();
  }
  CHECK_EQ(blocks, set.blocks());
  const size_t middle = set.blocks() / 2;
  const auto half = set.GetSubRanges(middle, set.blocks() - middle);
  CHECK(half.has_value());
  CHECK_EQ(half->GetBlockNumber(0), set.GetBlockNumber(middle));
}

void check_merged(const RangeSet& set) {
  SortedRangeSet merged;
  merged.Insert(SortedRangeSet(std::vector<RangeSet::Range>(set.begin(), set.end())));
  CHECK_LE(merged.blocks(), set.blocks());
  for (size_t i = 1; i < merged.size(); ++i) {
    CHECK_LT(merged[i - 1].second, merged[i].first);
  }
  for (const auto& [first, second] : set) {
    for (const size_t block : {first, second - 1}) {
      const size_t offset = merged.GetOffsetInRangeSet(block << 12);
      CHECK_EQ(merged.GetBlockNumber(offset >> 12), block);
    }
    CHECK(merged.Overlaps(first << 12, 1));
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  const RangeSet set = RangeSet::Parse(text);
  if (set) {
    CHECK(RangeSet::Parse(set.ToString()) == set);
    check_parts(set);
    check_merged(set);
  } else {
    CHECK_EQ(set.blocks(), 0u);
  }
  return 0;
}
