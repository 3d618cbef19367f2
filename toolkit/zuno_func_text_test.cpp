#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <random>
#include <set>

#include "toolkit/zuno_func.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Pieces = std::vector<std::string>;

TEST(StripQuotes, TakesOneQuoteOffEachEnd) {
  const std::pair<std::string, std::string> cases[] = {
      {R"("both")", "both"},  {R"("start)", "start"},
      {R"(end")", "end"},     {R"("")", ""},
      {R"(")", ""},           {"", ""},
      {R"(""x"")", R"("x")"}, {R"(in"side)", R"(in"side)"}};
  for (const auto& [text, expected] : cases) {
    std::string buffer = text;
    char* str = buffer.data();
    ZunoFunc::Strip_Quotes(str);
    EXPECT_STREQ(str, expected.c_str()) << text;
  }
}

TEST(SplitByCharacter, YieldsPiecesInOrderWithoutAnEmptyLastOne) {
  EXPECT_THAT(ZunoFunc::split_string(",a,,b,", ',', false), ElementsAre("", "a", "", "b"));
  EXPECT_THAT(ZunoFunc::split_string(",a,,b,", ',', true), ElementsAre("a", "b"));
  EXPECT_THAT(ZunoFunc::split_string("one\ntwo", ',', false), ElementsAre("one\ntwo"));
  EXPECT_THAT(ZunoFunc::split_string("", ',', false), IsEmpty());
  EXPECT_THAT(ZunoFunc::split_string("a,b", '\0', false), IsEmpty());
}

TEST(SplitByAnyCharacter, ResumesTheWholeLengthOfTheDelimitersLater) {
  struct Case {
    const char* text;
    const char* delimiters;
    Pieces all;
    Pieces filled;
  };
  const Case cases[] = {
      {"/a//b/", "/", {"", "a", "", "b", ""}, {"a", "b"}},
      {"", "/", {""}, {}},
      {"abc", "", {"abc"}, {"abc"}},
      {"a,xb;yc", ",;", {"a", "b", "c"}, {"a", "b", "c"}},  // x and y are skipped
      {"a,;b", ",;", {"a", "b"}, {"a", "b"}},
      {"a,", ",;:", {"a", ""}, {"a"}},  // the stride ends beyond the text
  };
  for (const Case& c : cases) {
    EXPECT_EQ(ZunoFunc::Split_String(c.text, c.delimiters, false), c.all) << c.text;
    EXPECT_EQ(ZunoFunc::Split_String(c.text, c.delimiters, true), c.filled) << c.text;
  }
}

TEST(Trim, RemovesBlanksAndControlCharactersNineToThirteenFromTheEnds) {
  EXPECT_EQ(ZunoFunc::Trim("\t\n\v\f\r a \t b \r\f\v\n\t"), "a \t b");
  EXPECT_EQ(ZunoFunc::Trim(" \t "), "");
  EXPECT_EQ(ZunoFunc::Trim(""), "");
  EXPECT_EQ(ZunoFunc::Trim("\x08 a\xa0"), "\x08 a\xa0");
  EXPECT_EQ(ZunoFunc::Trim(std::string("\0 ", 2)), std::string("\0", 1));
}

TEST(Numbers, AreReadFromTheStartOfTheText) {
  struct Case {
    const char* text;
    bool is_number;
    int number;
  };
  const Case cases[] = {{"12abc", true, 12},
                        {" 42", true, 42},
                        {"\t\n-7 8", true, -7},
                        {"2147483647", true, 2147483647},
                        {"abc", false, 0},
                        {"", false, 0},
                        {"2147483648", false, 2147483647}};
  for (const Case& c : cases) {
    EXPECT_EQ(ZunoFunc::isNumber(c.text), c.is_number) << c.text;
    EXPECT_EQ(ZunoFunc::to_number(c.text), c.number) << c.text;
  }
  EXPECT_EQ(ZunoFunc::to_string(0), "0");
  EXPECT_EQ(ZunoFunc::to_string(18446744073709551615UL), "18446744073709551615");
}

TEST(Random, DrawsFromTheWholeRangeAnewOnEachCall) {
  std::set<int> values;
  bool upper_half = false;
  bool lower_half = false;
  for (int i = 0; i < 200; ++i) {
    const int value = ZunoFunc::random();
    ASSERT_GE(value, 1);
    values.insert(value);
    (value > 1 << 30 ? upper_half : lower_half) = true;
  }
  // Two equal values among 200 come up once in a hundred thousand runs; four do not.
  EXPECT_GE(values.size(), 197U);
  EXPECT_TRUE(upper_half && lower_half);
}

}  // namespace
