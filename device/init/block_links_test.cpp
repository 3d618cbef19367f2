#include "device/init/block_links.h"

#include <android-base/file.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <map>

namespace sentrova::device {
namespace {

TEST(ParseBlockUevent, WantsNamesThatDoNotLeadElsewhere) {
  const auto partition = parse_block_uevent(
      "MAJOR=254\nMINOR=1\nDEVNAME=vda1\nDEVTYPE=partition\nPARTN=1\nPARTNAME=user data\n");
  ASSERT_TRUE(partition);
  EXPECT_EQ(partition->device + " " + partition->name, "vda1 user data");
  for (const char* text :
       {"", "DEVNAME=vda\nDEVTYPE=disk\n", "PARTNAME=misc\n", "DEVNAME=vda1\nPARTNAME=\n",
        "DEVNAME=vda1\nPARTNAME=..\n", "DEVNAME=vda1\nPARTNAME=../../etc/passwd\n",
        "DEVNAME=../vda1\nPARTNAME=misc\n"}) {
    EXPECT_FALSE(parse_block_uevent(text)) << text;
  }
}

TEST(LinkPartitions, LinksEachNameToItsFirstDevice) {
  const TemporaryDir folder;
  const std::filesystem::path root(folder.path);
  for (const auto& [device, name] :
       std::map<std::string, std::string>{{"vda1", "misc"}, {"vda2", "super"}, {"vdb1", "misc"}}) {
    std::filesystem::create_directories(root / "class" / device);
    ASSERT_TRUE(android::base::WriteStringToFile("DEVNAME=" + device + "\nPARTNAME=" + name + "\n",
                                                 root / "class" / device / "uevent"));
  }
  EXPECT_EQ(link_partitions(root / "class", root / "dev/by-name"), 2);
  EXPECT_EQ(std::filesystem::read_symlink(root / "dev/by-name/misc"), "/dev/block/vda1");
  EXPECT_EQ(std::filesystem::read_symlink(root / "dev/by-name/super"), "/dev/block/vda2");
  std::filesystem::remove_all(root / "dev");
  std::filesystem::remove_all(root / "class");
}

}  // namespace
}  // namespace sentrova::device
