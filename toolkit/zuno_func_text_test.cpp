#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>

#include "toolkit/zuno_func.h"

namespace {

using ::testing::ElementsAre;
using Pieces = std::vector<std::string>;

TEST(Text, LosesOneQuoteOffEachEnd) {
  const std::pair<std::string, std::string> rows[] = {
      {R"("start)", "start"}, {R"(end")", "end"},          {R"("")", ""}, {R"(")", ""}, {"", ""},
      {R"(""x"")", R"("x")"}, {R"(in"side)", R"(in"side)"}};
  for (const auto& [text, expected] : rows) {
    std::string buffer = text;
    char* str = buffer.data();
    ZunoFunc::Strip_Quotes(str);
    EXPECT_STREQ(str, expected.c_str()) << text;
  }
}

TEST(Text, IsSplitByACharacterWithoutAnEmptyLastPiece) {
  EXPECT_THAT(ZunoFunc::split_string(",a\n,,b,", ',', false), ElementsAre("", "a\n", "", "b"));
  EXPECT_THAT(ZunoFunc::split_string(",a\n,,b,", ',', true), ElementsAre("a\n", "b"));
  EXPECT_EQ(ZunoFunc::split_string("", ',', false), Pieces());
  EXPECT_EQ(ZunoFunc::split_string("a,b", '\0', false), Pieces());
}

TEST(Text, IsSplitByAnyCharacterAndResumedTheWholeLengthOfTheDelimitersLater) {
  struct Row {
    const char *text, *delimiters;
    Pieces all, filled;
  };
  const Row rows[] = {
      {"/a//b/", "/", {"", "a", "", "b", ""}, {"a", "b"}},
      {"", "/", {""}, {}},
      {"abc", "", {"abc"}, {"abc"}},
      {"a,xb;yc", ",;", {"a", "b", "c"}, {"a", "b", "c"}},  // x and y are skipped
      {"a,", ",;:", {"a", ""}, {"a"}},                      // the stride ends beyond the text
  };
  for (const Row& row : rows) {
    EXPECT_EQ(ZunoFunc::Split_String(row.text, row.delimiters, false), row.all) << row.text;
    EXPECT_EQ(ZunoFunc::Split_String(row.text, row.delimiters, true), row.filled) << row.text;
  }
}

TEST(Text, IsTrimmedOfBlanksAndControlCharactersNineToThirteen) {
  EXPECT_EQ(ZunoFunc::Trim("\t\n\v\f\r a \t b \r\f\v\n\t"), "a \t b");
  EXPECT_EQ(ZunoFunc::Trim(" \t ") + ZunoFunc::Trim(""), "");
  EXPECT_EQ(ZunoFunc::Trim("\x08 a\xa0"), "\x08 a\xa0");
  EXPECT_EQ(ZunoFunc::Trim(std::string("\0 ", 2)), std::string("\0", 1));
}

TEST(Numbers, AreReadFromTheStartOfTheText) {
  struct Row {
    const char* text;
    bool is_number;
    int number;
  };
  for (const Row& row : {Row{"12abc", true, 12}, Row{"\t\n-7 8", true, -7}, Row{"abc", false, 0},
                         Row{"", false, 0}, Row{"2147483648", false, 2147483647}}) {
    EXPECT_EQ(ZunoFunc::isNumber(row.text), row.is_number) << row.text;
    EXPECT_EQ(ZunoFunc::to_number(row.text), row.number) << row.text;
  }
  EXPECT_EQ(ZunoFunc::to_string(18446744073709551615UL), "18446744073709551615");
}

TEST(Numbers, AreDrawnFromTheWholeRangeAnewOnEachCall) {
  std::set<int> values;
  for (int i = 0; i < 200; ++i) {
    values.insert(ZunoFunc::random());
  }
  // Two equal values among 200 come up once in a hundred thousand runs; four do not.
  EXPECT_GE(values.size(), 197U);
  EXPECT_GE(*values.begin(), 1);
  EXPECT_LT(*values.begin(), 1 << 30);
  EXPECT_GT(*values.rbegin(), 1 << 30);
}

}  // namespace
