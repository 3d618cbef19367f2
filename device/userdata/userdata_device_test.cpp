#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <fs_mgr.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "device/userdata/lock.h"
#include "device/userdata/photograph.h"
#include "device/userdata/provisioning.h"
#include "device/userdata/sample_files.h"
#include "device/zunofscrypt/crypt_mapping.h"
#include "device/zunofscrypt/key_file.h"
#include "device/zunofscrypt/metadata_encryption.h"
#include "device/zunofscrypt/user_storage.h"
#include "tests/support/loop_device.h"

namespace sentrova {
namespace {

using android::base::ReadFileToString;
using android::base::unique_fd;
using android::base::WriteStringToFile;
using android::fs_mgr::Fstab;
using android::fs_mgr::FstabEntry;
using sentrova::testing::LoopDevice;
using sentrova::testing::read_device;
using ::testing::HasSubstr;

constexpr int64_t kPartitionBytes = 64 << 20;
constexpr char kSecret[] = "correct horse";

// User data on a loop device.
class UserData : public ::testing::Test {
 protected:
  ~UserData() override { close_user_data(places_, error_); }

  // Also reads the fstab's row.
  bool provision(UserDataKind kind) {
    const UserDataRequest request = {kind, "f2fs", partition_.path(), digest_file_.path};
    const TemporaryFile fstab_file;
    Fstab fstab;
    if (!provision_user_data(places_, request, kSecret, error_) ||
        !WriteStringToFile(fstab_text(places_, request), fstab_file.path) ||
        !ReadFstabFromFile(fstab_file.path, &fstab) || fstab.size() != 2) {
      return false;
    }
    row_ = fstab[1];
    return true;
  }

  bool mount_data() {
    row_.blk_device = partition_.path();
    return fs_mgr_do_mount_one(row_, places_.data) == FS_MGR_DOMNT_SUCCESS;
  }

  bool unlock_de() { return unlock_device_encrypted(places_, error_); }
  bool unlock_ce(const std::string& secret) {
    return unlock_credential_encrypted(places_, 0, secret, error_);
  }
  bool lock() { return lock_user_data(places_, error_); }

  // The photograph's digest and path as sha256sum prints them; empty where it cannot be read.
  std::string photograph() const {
    const std::string path = places_.data + kPhotographFile;
    std::string bytes;
    return ReadFileToString(path, &bytes) ? sha256_text(bytes) + "  " + path + "\n" : "";
  }
  std::string recorded_photograph() const {
    std::string line;
    ReadFileToString(digest_file_.path, &line);
    return line;
  }
  std::string mapping() {
    return find_mapping(places_.mapping, error_).value_or("the kernel does not tell");
  }

  const LoopDevice partition_{kPartitionBytes};
  const TemporaryDir metadata_;
  const TemporaryDir data_;
  const TemporaryFile digest_file_;
  const Places places_ = {metadata_.path, data_.path, "userdata_test"};
  FstabEntry row_;
  std::string error_;
};

TEST_F(UserData, WhatIsInUseIsNotTakenAway) {
  ASSERT_TRUE(provision(UserDataKind::kFileEncryptedWithMetadata)) << error_;
  ASSERT_TRUE(unlock_metadata(places_, row_, error_) && unlock_de() && unlock_ce(kSecret));
  unique_fd holder(open((places_.data + kPhotographFile).c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_TRUE(holder.ok());
  EXPECT_FALSE(lock());
  EXPECT_THAT(error_, HasSubstr("files are busy"));
  EXPECT_TRUE(unlock_ce(kSecret)) << "from halfway: " << error_;
  EXPECT_FALSE(remove_mapping(places_.mapping, error_)) << "mounted";
  EXPECT_EQ(errno, EBUSY);
  EXPECT_FALSE(provision(UserDataKind::kPlain));
  EXPECT_THAT(error_, HasSubstr("the user data is unlocked"));
  EXPECT_EQ(photograph(), recorded_photograph());
  holder.reset(open(places_.data.c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_FALSE(lock());
  EXPECT_THAT(error_, HasSubstr("cannot unmount"));
  holder.reset();
  EXPECT_TRUE(lock()) << "from halfway: " << error_;
}

// What may happen to a file with a key.
enum class Damage { kMissing, kCutShort, kOneBit, kAnotherKey };

bool damage_file(const std::string& path, Damage damage, const std::string& another) {
  std::string bytes;
  switch (damage) {
    case Damage::kMissing:
      return unlink(path.c_str()) == 0;
    case Damage::kCutShort:
      return truncate(path.c_str(), 31) == 0;
    case Damage::kOneBit:
      return ReadFileToString(path, &bytes) && (bytes.back() ^= 1, WriteStringToFile(bytes, path));
    case Damage::kAnotherKey:
      return ReadFileToString(another, &bytes) && WriteStringToFile(bytes, path);
  }
  return false;
}

TEST_F(UserData, MissingAndDamagedKeysFailWithTheirNameAndChangeNothing) {
  ASSERT_TRUE(provision(UserDataKind::kFileEncryptedWithMetadata)) << error_;
  const auto unlock = [this] {
    return unlock_metadata(places_, row_, error_) && unlock_de() && unlock_ce(kSecret);
  };
  EXPECT_NE(mount(partition_.path().c_str(), data_.path, "f2fs", 0, ""), 0);
  EXPECT_EQ(read_device(partition_.path(), 0, kPartitionBytes).find(kPhotographComment),
            std::string::npos);
  const std::string metadata_key = metadata_key_path(row_);
  const struct {
    std::string path;
    std::string another;
    bool mapped;
  } keys[] = {{metadata_key, places_.device_secret(), false},
              {places_.device_secret(), "/dev/null", false},
              {places_.de_key(), metadata_key, true},
              {places_.ce_key(0), places_.de_key(), true}};
  for (const auto& [path, another, mapped] : keys) {
    for (const Damage damage :
         {Damage::kMissing, Damage::kCutShort, Damage::kOneBit, Damage::kAnotherKey}) {
      SCOPED_TRACE(path + " " + std::to_string(static_cast<int>(damage)));
      ASSERT_TRUE(unlock()) << error_;
      std::string kept;
      ASSERT_TRUE(ReadFileToString(path, &kept));
      ASSERT_TRUE(damage_file(path, damage, another));
      ASSERT_TRUE(lock()) << error_;

      error_.clear();
      EXPECT_FALSE(unlock());
      EXPECT_NE(error_, "");
      EXPECT_EQ(!mapping().empty(), mapped);
      EXPECT_EQ(photograph(), "");

      // The folder of this key may be reached with the others' keys alone.
      ASSERT_TRUE(!mapped || unlock_de() || path == places_.de_key());
      ASSERT_TRUE(replace_file(path, kept.data(), kept.size(), error_)) << error_;
    }
  }
  ASSERT_TRUE(unlock_metadata(places_, row_, error_) && unlock_de());
  EXPECT_FALSE(unlock_ce("wrong horse") || unlock_ce(kAbsentCredential));
  EXPECT_EQ(photograph(), "");
  EXPECT_TRUE(unlock());
  EXPECT_FALSE(unlock_ce("wrong horse")) << "it is open, but the secret is still wrong";
  EXPECT_EQ(photograph(), recorded_photograph());
  EXPECT_NE(photograph(), "");
}

TEST_F(UserData, AMissingFolderKeepsNoOtherLockedButOneUnderAnotherKeyDoes) {
  ASSERT_TRUE(provision(UserDataKind::kFileEncrypted)) << error_;
  ASSERT_TRUE(mount_data() && unlock_de() && unlock_ce(kSecret)) << error_;
  const std::string folder = places_.ce_folders(0)[1];
  const std::optional<KeyIdentifier> de = read_policy(places_.de_folders()[0], error_);
  ASSERT_TRUE(de && std::filesystem::remove_all(folder) > 0) << error_;
  ASSERT_TRUE(lock() && mount_data() && unlock_de()) << error_;
  EXPECT_TRUE(unlock_ce(kSecret)) << error_;
  EXPECT_EQ(photograph(), recorded_photograph());

  ASSERT_TRUE(std::filesystem::create_directory(folder) && set_policy(folder, *de, error_));
  EXPECT_FALSE(unlock_ce(kSecret));
  EXPECT_THAT(error_, HasSubstr(folder + ": encrypted under another key"));
}

TEST_F(UserData, AMappingThatWasLeftHalfMadeIsMadeAnew) {
  ASSERT_TRUE(provision(UserDataKind::kFileEncryptedWithMetadata)) << error_;
  setenv("DM_DISABLE_UDEV", "1", 1);
  ASSERT_EQ(testing::run_program({"/system/bin/dmsetup", "create", "--notable", places_.mapping}),
            0);
  EXPECT_TRUE(unlock_metadata(places_, row_, error_)) << error_;
  EXPECT_NE(mapping(), "");
}

}  // namespace
}  // namespace sentrova
