#include "otautil/rangeset.h"

#include <android-base/logging.h>
#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <tuple>
#include <vector>

namespace {

using Ranges = std::vector<RangeSet::Range>;
using Texts = std::vector<std::string>;

constexpr size_t kLargest = std::numeric_limits<size_t>::max();
constexpr size_t kBlock = 4096;

// Collects the messages of one test.
class RangeSets : public ::testing::Test {
 protected:
  RangeSets() {
    android::base::SetLogger(
        [this](auto, auto, auto, auto, auto, const char* text) { log_ += text; });
  }
  ~RangeSets() override { android::base::SetLogger(android::base::StderrLogger); }

  std::string take_log() { return std::exchange(log_, ""); }

  std::string log_;
};

TEST_F(RangeSets, AreReadFromTheTextFormAndWrittenInIt) {
  const std::tuple<const char*, const char*, size_t> cases[] = {
      {"4,30,40,5,35", "4,30,40,5,35", 40},
      {"2,0x10,0X1f", "2,16,31", 15},
      {"0x2,1, 3", "2,1,3", 2},
      {"\t2,\n\v\f\r 1,+3", "2,1,3", 2},
      {"2,0,2147483647", "2,0,2147483647", 2147483647},
      {"2,007,08", "2,7,8", 1}};
  for (const auto& [text, canonical, blocks] : cases) {
    const RangeSet set = RangeSet::Parse(text);
    EXPECT_TRUE(set) << text;
    EXPECT_EQ(set.ToString(), canonical) << text;
    EXPECT_EQ(set.blocks(), blocks) << text;
  }
  EXPECT_EQ(take_log(), "");
  EXPECT_EQ(RangeSet().ToString(), "");
}

TEST_F(RangeSets, AreNotReadFromAnythingElse) {
  const std::pair<std::string, std::string> cases[] = {
      {"2,1", "Invalid range text: 2,1"},
      {"2 ,1,3", "Failed to parse the number of tokens: 2 ,1,3"},
      {"0,1,2", "Invalid number of tokens: 0,1,2"},
      {"3,1,3,5", "Number of tokens must be even: 3,1,3,5"},
      {"4,1,3", "Mismatching number of tokens: 4,1,3"},
      {"2,1,3,", "Mismatching number of tokens: 2,1,3,"},
      {"2147483648,1,3", "Failed to parse the number of tokens: 2147483648,1,3"},
      {"4,1,3,5,4", "Empty or negative range: 5, 4"},
  };
  for (const auto& [text, message] : cases) {
    EXPECT_FALSE(RangeSet::Parse(text)) << text;
    EXPECT_EQ(take_log(), message);
  }
  for (const std::string number : {"", " ", "-1", "3 ", "3x", "0x", "0x-3", "+ 3", "+-3", "+0x3",
                                   "0x+3", "2147483648", "0x80000000", "18446744073709551619"}) {
    EXPECT_FALSE(RangeSet::Parse("2,1," + number)) << number;
    EXPECT_FALSE(RangeSet::Parse("2," + number + ",4")) << number;
    EXPECT_EQ(take_log(), "") << number;
  }
  EXPECT_FALSE(RangeSet::Parse(std::string("2,1,3\0", 6))) << "a NUL is no end";
}

TEST_F(RangeSets, AreFilledRangeByRange) {
  RangeSet set({{10, 20}, {5, 8}});
  EXPECT_EQ(Ranges(set.begin(), set.end()), (Ranges{{10, 20}, {5, 8}}));
  EXPECT_NE(set, RangeSet({{5, 8}, {10, 20}}));
  EXPECT_FALSE(set.PushBack({0, kLargest - 13}));
  EXPECT_EQ(take_log(), "RangeSet size overflow");
  EXPECT_EQ(set.size(), 2u);
  EXPECT_TRUE(set.PushBack({0, kLargest - 14}));
  EXPECT_EQ(set.blocks(), kLargest - 1);
  set.Clear();
  EXPECT_FALSE(set);
  EXPECT_EQ(set.blocks(), 0u);

  EXPECT_FALSE(RangeSet({{1, 2}, {3, 3}, {4, 5}}));
  EXPECT_EQ(take_log(), "Empty or negative range: 3, 3");
  EXPECT_FALSE(RangeSet(Ranges()));
  EXPECT_EQ(take_log(), "Invalid number of tokens");
}

TEST_F(RangeSets, SplitIntoGroupsOfNearlyEqualSize) {
  const std::tuple<RangeSet, size_t, Texts> cases[] = {
      {RangeSet({{0, 10}}), 3, {"2,0,4", "2,4,7", "2,7,10"}},
      {RangeSet({{0, 2}, {5, 9}}), 2, {"4,0,2,5,6", "2,6,9"}},
      {RangeSet({{5, 9}, {0, 2}}), 1, {"4,5,9,0,2"}},
      {RangeSet({{7, 8}, {1, 2}, {3, 4}}), kLargest, {"2,7,8", "2,1,2", "2,3,4"}},
      {RangeSet({{0, 10}}), 0, {}},
      {RangeSet(), 5, {}}};
  for (const auto& [set, groups, expected] : cases) {
    Texts texts;
    for (const RangeSet& group : set.Split(groups)) {
      texts.push_back(group.ToString());
    }
    EXPECT_EQ(texts, expected) << set.ToString() << " into " << groups;
  }
}

TEST_F(RangeSets, GiveTheirBlocksByIndex) {
  const RangeSet set({{5, 9}, {0, 2}});
  std::vector<size_t> blocks;
  for (size_t i = 0; i < set.blocks(); ++i) {
    blocks.push_back(set.GetBlockNumber(i));
  }
  EXPECT_EQ(blocks, (std::vector<size_t>{5, 6, 7, 8, 0, 1}));
  EXPECT_EQ(RangeSet({{0, 2}, {5, 9}}).GetSubRanges(1, 3), RangeSet({{1, 2}, {5, 7}}));
  EXPECT_EQ(set.GetSubRanges(0, 6), set);
  EXPECT_EQ(set.GetSubRanges(4, 1), RangeSet({{0, 1}}));
  for (const auto& [start, count] :
       {RangeSet::Range{5, 2}, {7, 0}, {1, kLargest}, {kLargest, 1}, {0, 7}}) {
    EXPECT_EQ(set.GetSubRanges(start, count), std::nullopt);
    EXPECT_EQ(take_log(), "Failed to get the sub ranges for start_index " + std::to_string(start) +
                              " num_of_blocks " + std::to_string(count) +
                              " total number of blocks the range contains is 6");
  }
  EXPECT_EQ(set.GetSubRanges(6, 0), RangeSet());
  EXPECT_EQ(take_log(), "num_of_blocks is zero when calling GetSubRanges()");
  // Death tests read what the child writes.
  android::base::SetLogger(android::base::StderrLogger);
  EXPECT_DEATH(set.GetBlockNumber(6), "Check failed: .*Out of bound index 6 \\(total blocks: 6\\)");
}

TEST_F(RangeSets, MergeWhatIsInsertedIntoSortedOnes) {
  const std::pair<Ranges, const char*> cases[] = {
      {{{10, 20}, {20, 30}}, "2,10,30"},
      {{{5, 8}, {1, 6}}, "2,1,8"},
      {{{5, 6}, {1, 2}, {3, 4}}, "6,1,2,3,4,5,6"},
      {{{5, 6}, {1, 9}, {2, 3}, {7, 7}}, "2,1,9"},
      {{{0, kLargest - 1}, {3, kLargest}}, "2,0,18446744073709551615"},
  };
  for (const auto& [ranges, expected] : cases) {
    SortedRangeSet set;
    for (const RangeSet::Range& range : ranges) {
      set.Insert(range);
    }
    EXPECT_EQ(set.ToString(), expected);
  }
  SortedRangeSet set({{5, 8}, {1, 3}, {2, 6}});
  EXPECT_EQ(set.ToString(), "6,1,3,2,6,5,8") << "sorted, not merged";
  set.Insert(SortedRangeSet());
  EXPECT_EQ(set.size(), 3u);
  set.Insert(set);
  EXPECT_EQ(set.ToString(), "2,1,8");
  EXPECT_EQ(set.blocks(), 7u);
}

TEST_F(RangeSets, TakeBytesIfSorted) {
  const std::tuple<size_t, size_t, const char*> cases[] = {
      {4095, 2, "2,0,2"},
      {kLargest, 1, "2,4503599627370495,4503599627370496"},
      {4097, 0, ""},
      {4096, kLargest, ""},
      {4096, 4096, "2,1,2"}};
  for (const auto& [start, length, expected] : cases) {
    SortedRangeSet set;
    set.Insert(start, length);
    EXPECT_EQ(set.ToString(), expected) << start << " " << length;
  }
  const SortedRangeSet set({{0, 2}, {5, 9}});
  EXPECT_FALSE(set.Overlaps(2 * kBlock, 3 * kBlock));
  EXPECT_TRUE(set.Overlaps(2 * kBlock, 3 * kBlock + 1));
  EXPECT_TRUE(set.Overlaps(2 * kBlock - 1, 1));
  EXPECT_FALSE(set.Overlaps(5 * kBlock + 1, 0));
  EXPECT_TRUE(set.Overlaps(RangeSet({{8, 20}, {30, 40}})));
  EXPECT_FALSE(set.Overlaps(RangeSet({{2, 5}, {9, 10}})));
  EXPECT_EQ(set.GetOffsetInRangeSet(5 * kBlock + 7), 2 * kBlock + 7);
  android::base::SetLogger(android::base::StderrLogger);
  EXPECT_DEATH(set.GetOffsetInRangeSet(2 * kBlock),
               "Check failed: .*block_start 2 is missing between two ranges: 4,0,2,5,9");
  EXPECT_DEATH(set.GetOffsetInRangeSet(9 * kBlock),
               "Check failed: .*block_start 9 exceeds the limit of current RangeSet: 4,0,2,5,9");
}

}  // namespace
