// The examples of the pages on formats, against the code: a row of a table that begins with a code
// span is an example.
#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/parseint.h>
#include <android-base/stringprintf.h>
#include <android-base/strings.h>
#include <gtest/gtest.h>
#include <stdio.h>

#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

#include "datadump/datadump.h"
#include "kBlockMapPage.h"
#include "kDataDumpPage.h"
#include "kRangeSetPage.h"
#include "otautil/sysutil.h"
#include "tests/support/private_mounts.h"

namespace {

using android::base::Split;
using android::base::StringReplace;
using android::base::Trim;
using Row = std::vector<std::string>;

// A cell without the marks of code, and with the escapes \n, \r, \t and \0 undone.
std::string cell_text(std::string cell) {
  cell = cell.substr(1, cell.size() - 2);  // the blanks inside the table's lines
  if (!cell.starts_with('`')) {
    return cell;
  }
  cell = cell.substr(1, cell.size() - 2);
  for (const auto& [escape, character] : {std::pair{"\\n", '\n'}, {"\\r", '\r'}, {"\\t", '\t'}}) {
    cell = StringReplace(cell, escape, std::string(1, character), true);
  }
  return StringReplace(cell, "\\0", std::string(1, '\0'), true);
}

// The rows of examples in the table whose head begins with `head`.
std::vector<Row> examples(std::string_view page, const std::string& head) {
  const size_t start = page.find("\n| " + head + " |");
  EXPECT_NE(start, page.npos) << head;
  std::vector<Row> rows;
  for (const std::string& line : Split(std::string(page.substr(start + 1)), "\n")) {
    if (!line.starts_with("|")) {
      break;
    }
    if (line.starts_with("| `")) {
      Row& row = rows.emplace_back();
      const std::vector<std::string> cells = Split(line, "|");
      for (size_t i = 1; i + 1 < cells.size(); ++i) {
        row.push_back(cell_text(cells[i]));
      }
    }
  }
  EXPECT_GE(rows.size(), 3U) << head;
  return rows;
}

// The bytes of hexadecimal digits in pairs; those that are shown as ".." are left out.
std::string bytes_of(const std::string& digits) {
  std::string bytes;
  for (const std::string& pair : Split(digits, " ")) {
    unsigned char byte = 0;
    if (android::base::ParseUint("0x" + pair, &byte)) {
      bytes += static_cast<char>(byte);
    }
  }
  return bytes;
}

// The bytes of the page's dump.
std::string dumped_bytes(const std::string& page) {
  std::string bytes;
  for (const std::string& line : Split(page, "\n")) {
    const size_t text = line.find("  |");
    if (line.starts_with("    000") && text != line.npos) {
      bytes += bytes_of(line.substr(12, text - 12));
    }
  }
  return bytes;
}

std::string described(const RangeSet& set) {
  std::string text;
  for (const auto& [first, second] : set) {
    text += (text.empty() ? "" : " ") + android::base::StringPrintf("[%zu,%zu)", first, second);
  }
  return text;
}

// Returns the errors that a call logs, a dash if there are none.
template <typename Call>
std::string errors_of(Call call) {
  std::string errors;
  android::base::SetLogger([&](auto, auto, auto, auto, auto, const char* text) { errors += text; });
  call();
  android::base::SetLogger(android::base::StderrLogger);
  return errors.empty() ? "–" : errors;
}

TEST(FormatPages, RangeSetsAreTakenAndRefusedAsShown) {
  for (const Row& row : examples(kRangeSetPage, "text | ranges")) {
    const RangeSet set = RangeSet::Parse(row[0]);
    EXPECT_EQ(described(set), row[1]) << row[0];
    EXPECT_EQ(set.ToString(), row[2]);
  }
  for (const Row& row : examples(kRangeSetPage, "text | why")) {
    EXPECT_EQ(errors_of([&] { EXPECT_FALSE(RangeSet::Parse(row[0])) << row[0]; }), row[2]);
  }
  EXPECT_EQ(dumped_bytes(kRangeSetPage), examples(kRangeSetPage, "text | ranges")[0][0]);
}

TEST(FormatPages, BlockMapsAreTakenAndRefusedAsShown) {
  const TemporaryFile file;
  const auto read = [&](const std::string& text) {
    EXPECT_TRUE(android::base::WriteStringToFile(text, file.path));
    return BlockMapData::ParseBlockMapFile(file.path);
  };
  const std::string device = "/dev/block/sda3";
  const std::vector<Row> taken = examples(kBlockMapPage, "taken | ranges");
  for (const auto& row : taken) {
    const BlockMapData map = read(device + "\n" + row[0]);
    EXPECT_EQ(map.device_path, device) << row[0];
    EXPECT_EQ(described(map.block_ranges), row[1]);
  }
  for (const Row& row : examples(kBlockMapPage, "refused | why")) {
    EXPECT_EQ(errors_of([&] { EXPECT_FALSE(read(device + "\n" + row[0])) << row[0]; }), row[2]);
  }
  EXPECT_EQ(dumped_bytes(kBlockMapPage), device + "\n" + taken[0][0]);
}

class DataDumpPage : public ::testing::Test {
 protected:
  void SetUp() override { SKIP_WITHOUT_PRIVATE_ROOT(); }

  static void set_record(const std::string& bytes) {
    std::filesystem::create_directories("/dev/block/by-name");
    ASSERT_TRUE(android::base::WriteStringToFile(std::string(300, 'p') + bytes, kPartition));
  }
  static std::string record() {
    std::string bytes;
    EXPECT_TRUE(android::base::ReadFileToString(kPartition, &bytes));
    return bytes.substr(300);
  }
  static int call(const std::string& text) {
    unsigned long long offset = 0;
    if (sscanf(text.c_str(), "datadump_resize(%llu)", &offset) == 1) {
      return datadump_resize(offset);
    }
    EXPECT_TRUE(text == "datadump_enable()" || text == "datadump_disable()") << text;
    return text == "datadump_enable()" ? datadump_enable() : datadump_disable();
  }

  static constexpr char kPartition[] = "/dev/block/by-name/reserved";
};

TEST_F(DataDumpPage, RecordsMeanWhatIsShown) {
  const sentrova::testing::ScopedTmpfs dev("/dev");
  const std::vector<Row> rows = examples(kDataDumpPage, "record | status");
  for (const Row& row : rows) {
    set_record(bytes_of(row[0]));
    uint32_t first = 0, second = 0;
    uint64_t offset = 0;
    EXPECT_EQ(std::to_string(datadump_get_status()), row[1]) << row[0];
    EXPECT_EQ(datadump_query_flags(&first, &second, &offset), 0);
    EXPECT_EQ(android::base::StringPrintf("%08x %08x %016jx", first, second, uintmax_t{offset}),
              row[2]);
  }
  EXPECT_EQ(dumped_bytes(kDataDumpPage), bytes_of(rows[0][0]));
}

TEST_F(DataDumpPage, CallsWriteWhatIsShown) {
  const sentrova::testing::ScopedTmpfs dev("/dev");
  set_record(std::string(16, '\0'));
  for (const Row& row : examples(kDataDumpPage, "call | result")) {
    EXPECT_EQ(std::to_string(call(row[0])), row[1]) << row[0];
    EXPECT_EQ(record(), bytes_of(row[2])) << row[0];
  }
}

}  // namespace
