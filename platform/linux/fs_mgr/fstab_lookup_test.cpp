#include <fs_mgr/roots.h>
#include <gtest/gtest.h>

namespace {

using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using android::fs_mgr::GetEntryForPath;

Fstab make_table(const std::vector<std::string>& mount_points) {
  Fstab table;
  for (const std::string& mount_point : mount_points) {
    FstabEntry entry;
    entry.mount_point = mount_point;
    table.push_back(entry);
  }
  return table;
}

TEST(FstabLookup, FindsTheFirstRowOfTheNearestAncestorThatIsAMountPoint) {
  Fstab table = make_table({"/data", "/data/media", "/", "none", "/data", "/cache/"});
  const std::pair<const char*, const FstabEntry*> kCases[] = {{"/data", &table[0]},
                                                              {"/data/", &table[0]},
                                                              {"/data/app", &table[0]},
                                                              {"/data/media/0/a", &table[1]},
                                                              {"/data/mediax", &table[0]},
                                                              {"/database", &table[2]},
                                                              {"//", &table[2]},
                                                              {"/cache", &table[2]},
                                                              {"none/a", &table[3]},
                                                              {"system", nullptr},
                                                              {"", nullptr},
                                                              {"data/x", nullptr}};
  for (const auto& [path, expected] : kCases) {
    EXPECT_EQ(GetEntryForPath(&table, path), expected) << path;
  }
  table = make_table({"/data", ""});
  for (const char* path : {"/", "/cache/x", ""}) {
    EXPECT_EQ(GetEntryForPath(&table, path), nullptr) << path;
  }
}

}  // namespace
