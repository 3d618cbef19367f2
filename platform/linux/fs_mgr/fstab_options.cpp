#include "platform/linux/fs_mgr/fstab_options.h"

#include <android-base/parseint.h>
#include <android-base/strings.h>
#include <unistd.h>

#include <algorithm>
#include <bit>
#include <iterator>
#include <limits>
#include <string_view>

namespace sentrova::fs_mgr {

namespace {

using android::base::ParseByteCount;
using android::base::ParseInt;
using android::base::ParseUint;
using android::fs_mgr::FstabEntry;
using Flags = FstabEntry::FsMgrFlags;

constexpr char kDefaultEncryption[] = "aes-256-xts";
// What the formatting tools count in.
constexpr uint64_t kSmallestBlockBytes = 4096;
constexpr uint64_t kMaxBytes = std::numeric_limits<off64_t>::max();

struct FlagOption {
  std::string_view name;
  void (*set)(Flags& flags);
};

constexpr FlagOption kFlagOptions[] = {
    {"avb", [](Flags& flags) { flags.avb = true; }},
    {"check", [](Flags& flags) { flags.check = true; }},
    {"defaults", [](Flags&) {}},
    {"first_stage_mount", [](Flags& flags) { flags.first_stage_mount = true; }},
    {"formattable", [](Flags& flags) { flags.formattable = true; }},
    {"fscompress", [](Flags& flags) { flags.fs_compress = true; }},
    {"fsverity", [](Flags& flags) { flags.fs_verity = true; }},
    {"latemount", [](Flags& flags) { flags.late_mount = true; }},
    {"logical", [](Flags& flags) { flags.logical = true; }},
    {"metadata_csum", [](Flags& flags) { flags.ext_meta_csum = true; }},
    {"noemulatedsd", [](Flags& flags) { flags.no_emulated_sd = true; }},
    {"nofail", [](Flags& flags) { flags.no_fail = true; }},
    {"nonremovable", [](Flags& flags) { flags.nonremovable = true; }},
    {"notrim", [](Flags& flags) { flags.no_trim = true; }},
    {"quota", [](Flags& flags) { flags.quota = true; }},
    {"recoveryonly", [](Flags& flags) { flags.recovery_only = true; }},
    {"slotselect", [](Flags& flags) { flags.slot_select = true; }},
    {"slotselect_other", [](Flags& flags) { flags.slot_select_other = true; }},
    {"verify", [](Flags& flags) { flags.verify = true; }},
    {"verifyatboot", [](Flags& flags) { flags.verify_at_boot = true; }},
    {"wait", [](Flags& flags) { flags.wait = true; }},
};

// A hexadecimal number, or a decimal one with at most one letter for its unit. ParseByteCount alone
// looks at the first letter only and would take what follows for nothing.
bool read_bytes(const std::string& value, uint64_t& bytes) {
  if (android::base::StartsWith(value, "0x")) {
    return ParseUint(value, &bytes, kMaxBytes);
  }
  const size_t digits = value.find_first_not_of("0123456789");
  return digits != 0 && (digits == std::string::npos || digits == value.size() - 1) &&
         ParseByteCount(value, &bytes, kMaxBytes);
}

bool read_size(const std::string& value, off64_t& size) {
  uint64_t bytes = 0;
  if (!read_bytes(value, bytes)) {
    return false;
  }
  size = static_cast<off64_t>(bytes);
  return true;
}

bool read_block_size(const std::string& value, off64_t& size) {
  uint64_t bytes = 0;
  if (!read_bytes(value, bytes) || bytes < kSmallestBlockBytes || !std::has_single_bit(bytes)) {
    return false;
  }
  size = static_cast<off64_t>(bytes);
  return true;
}

// A byte count, or a percentage of the machine's memory.
bool read_zram_size(const std::string& value, off64_t& size) {
  if (!android::base::EndsWith(value, "%")) {
    return read_size(value, size);
  }
  int percent = 0;
  if (!ParseInt(value.substr(0, value.size() - 1), &percent, 0, 100)) {
    return false;
  }
  const off64_t memory_bytes = off64_t{sysconf(_SC_PHYS_PAGES)} * sysconf(_SC_PAGESIZE);
  size = memory_bytes / 100 * percent;
  return true;
}

// LABEL:PARTITION, where the partition is a number or "auto".
bool read_vold_managed(const std::string& value, FstabEntry& entry) {
  const size_t colon = value.find(':');
  if (colon == std::string::npos || colon == 0) {
    return false;
  }
  const std::string partition = value.substr(colon + 1);
  if (partition != "auto" && !ParseInt(partition, &entry.partnum, 0)) {
    return false;
  }
  entry.label = value.substr(0, colon);
  entry.fs_mgr_flags.vold_managed = true;
  return true;
}

bool read_checkpoint(const std::string& value, FstabEntry& entry) {
  entry.fs_mgr_flags.checkpoint_blk |= value == "block";
  entry.fs_mgr_flags.checkpoint_fs |= value == "fs";
  return value == "block" || value == "fs";
}

bool set_text(const std::string& value, std::string& text) {
  text = value;
  return !value.empty();
}

struct ValueOption {
  std::string_view name;
  bool (*set)(FstabEntry& entry, const std::string& value);
};

constexpr ValueOption kValueOptions[] = {
    {"avb",
     [](FstabEntry& entry, const std::string& value) {
       entry.fs_mgr_flags.avb = true;
       return set_text(value, entry.vbmeta_partition);
     }},
    {"avb_keys",
     [](FstabEntry& entry, const std::string& value) { return set_text(value, entry.avb_keys); }},
    {"checkpoint",
     [](FstabEntry& entry, const std::string& value) { return read_checkpoint(value, entry); }},
    {"encryptable",
     [](FstabEntry& entry, const std::string& value) {
       entry.fs_mgr_flags.crypt = true;
       return set_text(value, entry.key_loc);
     }},
    {"eraseblk",
     [](FstabEntry& entry, const std::string& value) {
       return read_block_size(value, entry.erase_blk_size);
     }},
    {"fileencryption",
     [](FstabEntry& entry, const std::string& value) {
       entry.fs_mgr_flags.file_encryption = true;
       entry.encryption_options = value.empty() ? kDefaultEncryption : value;
       return true;
     }},
    {"forceencrypt",
     [](FstabEntry& entry, const std::string& value) {
       entry.fs_mgr_flags.force_crypt = true;
       return set_text(value, entry.key_loc);
     }},
    {"forcefdeorfbe",
     [](FstabEntry& entry, const std::string& value) {
       entry.fs_mgr_flags.force_fde_or_fbe = true;
       entry.encryption_options = kDefaultEncryption;
       return set_text(value, entry.key_loc);
     }},
    {"keydirectory",
     [](FstabEntry& entry, const std::string& value) {
       return set_text(value, entry.metadata_key_dir);
     }},
    {"length",
     [](FstabEntry& entry, const std::string& value) { return ParseInt(value, &entry.length); }},
    {"logicalblk",
     [](FstabEntry& entry, const std::string& value) {
       return read_block_size(value, entry.logical_blk_size);
     }},
    {"max_comp_streams",
     [](FstabEntry& entry, const std::string& value) {
       return ParseInt(value, &entry.max_comp_streams, 0);
     }},
    {"metadata_encryption",
     [](FstabEntry& entry, const std::string& value) {
       return set_text(value, entry.metadata_encryption);
     }},
    {"reservedsize",
     [](FstabEntry& entry, const std::string& value) {
       return read_size(value, entry.reserved_size);
     }},
    {"swapprio",
     [](FstabEntry& entry, const std::string& value) { return ParseInt(value, &entry.swap_prio); }},
    {"sysfs_path",
     [](FstabEntry& entry, const std::string& value) { return set_text(value, entry.sysfs_path); }},
    {"voldmanaged",
     [](FstabEntry& entry, const std::string& value) { return read_vold_managed(value, entry); }},
    {"zram_backingdev_size",
     [](FstabEntry& entry, const std::string& value) {
       return read_bytes(value, entry.zram_backingdev_size);
     }},
    {"zramsize", [](FstabEntry& entry,
                    const std::string& value) { return read_zram_size(value, entry.zram_size); }},
};

template <typename Option, size_t kCount>
const Option* find_option(const Option (&options)[kCount], std::string_view name) {
  const auto* const found = std::find_if(std::begin(options), std::end(options),
                                         [name](const Option& row) { return row.name == name; });
  return found == std::end(options) ? nullptr : found;
}

enum class Outcome { kApplied, kUnknown, kMalformed };

// An option without "=" is a flag if there is such a flag, else an option with an empty value.
Outcome apply_option(const std::string& option, FstabEntry& entry) {
  const size_t equals = option.find('=');
  if (equals == std::string::npos) {
    if (const FlagOption* const flag = find_option(kFlagOptions, option); flag != nullptr) {
      flag->set(entry.fs_mgr_flags);
      return Outcome::kApplied;
    }
  }
  const ValueOption* const known = find_option(kValueOptions, option.substr(0, equals));
  if (known == nullptr) {
    return Outcome::kUnknown;
  }
  const std::string value = equals == std::string::npos ? "" : option.substr(equals + 1);
  return known->set(entry, value) ? Outcome::kApplied : Outcome::kMalformed;
}

}  // namespace

std::string apply_fs_mgr_options(const std::string& text, FstabEntry& entry, std::string& unknown) {
  for (const std::string& option : android::base::Split(text, ",")) {
    if (option.empty()) {
      continue;
    }
    switch (apply_option(option, entry)) {
      case Outcome::kApplied:
        break;
      case Outcome::kUnknown:
        unknown += (unknown.empty() ? "" : ",") + option;
        break;
      case Outcome::kMalformed:
        return "bad value of option \"" + option.substr(0, option.find('=')) + "\"";
    }
  }
  return "";
}

}  // namespace sentrova::fs_mgr
