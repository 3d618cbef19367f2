#include "cli/table.h"

#include <android-base/strings.h>
#include <gtest/gtest.h>

#include <string>
#include <utility>

#include "cli/mounts.h"
#include "cli/printable.h"

namespace {

using sentrova::display_width;
using sentrova::printable;
using sentrova::shortened;
using sentrova::Table;

TEST(Printable, LeavesNothingThatActsOnATerminal) {
  const std::pair<std::string, std::string> cases[] = {
      {"plain text\\", "plain text\\"},
      {"\033[31mred\a\tx\n", "\\x1b[31mred\\x07\\x09x\\x0a"},
      {std::string("a\0b\x7f", 4), "a\\x00b\\x7f"},
      {"\xC2\x9B"
       "31m",
       "\\xc2\\x9b31m"},                          // the same in one control character
      {"\xE2\x80\xAEtxt", "\\xe2\\x80\\xaetxt"},  // from right to left
      {"f\xC3\xBCr \xE7\x85\xA7\xF0\x9F\x93\xB7", "f\xC3\xBCr \xE7\x85\xA7\xF0\x9F\x93\xB7"},
      {"\xC0\xAF\xE0\x80\xAF", "\\xc0\\xaf\\xe0\\x80\\xaf"},  // longer than need be
      {"\xE7\x85", "\\xe7\\x85"},                             // cut off
      {"\xED\xA0\x80\xFF\xF4\x90\x80\x80", "\\xed\\xa0\\x80\\xff\\xf4\\x90\\x80\\x80"},
  };
  for (const auto& [text, expected] : cases) {
    EXPECT_EQ(printable(text), expected);
  }
}

TEST(Shortened, KeepsTheEndInWholeCharacters) {
  const std::string wide = "ab\xE7\x85\xA7\xE7\x89\x87";  // two of two columns each
  EXPECT_EQ(display_width(wide), 6u);
  EXPECT_EQ(display_width("e\xCC\x81"), 1u);
  const struct {
    std::string text;
    size_t width;
    std::string expected;
  } cases[] = {
      {"/dev/block", 10, "/dev/block"},
      {"/dev/block", 9, ".../block"},
      {"/dev/block", 2, ".."},
      {wide, 6, wide},
      {wide, 5, "...\xE7\x89\x87"},
      {wide, 4, "..."},
      {"", 0, ""},
      {"x", 0, ""},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(shortened(c.text, c.width), c.expected) << c.text << " " << c.width;
  }
}

TEST(Table, FitsTheTerminalAndStaysOneLineARow) {
  Table table({"VOLUME", "DEVICE", "MOUNTED"});
  EXPECT_EQ(table.aligned(80), "");
  EXPECT_EQ(table.tab_separated(), "");
  table.add_row({"/cache", "/dev/block/by-name/logdata", "yes"});
  table.add_row({"/\tx\n", "", "-"});
  EXPECT_EQ(table.aligned(80),
            "VOLUME      DEVICE                      MOUNTED\n"
            "/cache      /dev/block/by-name/logdata  yes\n"
            "/\\x09x\\x0a                              -");
  EXPECT_EQ(table.tab_separated(), "/cache\t/dev/block/by-name/logdata\tyes\n/\\x09x\\x0a\t\t-");
  for (const size_t width : {16u, 20u, 33u, 46u}) {
    for (const std::string& line : android::base::Split(table.aligned(width), "\n")) {
      EXPECT_LE(display_width(line), width) << line;
    }
  }
  EXPECT_NE(table.aligned(1), "") << "too narrow for any";
}

TEST(HumanSize, HasTwoDigitsOrMore) {
  const std::pair<uint64_t, const char*> cases[] = {
      {0, "0"},           {1023, "1023"},    {1024, "1.0K"},       {10188, "9.9K"}, {10189, "10K"},
      {1048063, "1023K"}, {1048064, "1.0M"}, {3ull << 30, "3.0G"}, {~0ull, "16E"},
  };
  for (const auto& [bytes, expected] : cases) {
    EXPECT_EQ(sentrova::human_size(bytes), expected) << bytes;
  }
}

}  // namespace
