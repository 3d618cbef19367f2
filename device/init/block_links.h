#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace sentrova::device {

// A partition with a name in its disk's GPT.
struct NamedPartition {
  std::string device;  // the kernel's name, as "vda1"
  std::string name;
};

// Reads the text of a block device's uevent file. Returns nothing for a device without a partition
// name, and for a name that cannot be a file name.
std::optional<NamedPartition> parse_block_uevent(std::string_view text);

// Makes a link in `link_directory`, which it creates, for each named partition under
// `sys_class_block` (/sys/class/block), to /dev/block/DEVICE. The first of two partitions of one
// name keeps it. Returns the number of links made; failures are logged.
int link_partitions(const std::string& sys_class_block, const std::string& link_directory);

}  // namespace sentrova::device
