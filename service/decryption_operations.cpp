#include <android-base/properties.h>
#include <stdio.h>
#include <zunofscrypt.h>

#include <cstdint>
#include <string>
#include <vector>

#include "common/wipe.h"
#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"
#include "service/owner_guard_manager.h"
#include "service/sentrova_service.h"
#include "toolkit/zuno_func.h"

using android::base::SetProperty;

namespace android {
namespace {

constexpr char kTag[] = "SentrovaService";
constexpr char kDataMountPoint[] = "/data";
constexpr char kVolumeDaemon[] = "/system/bin/zuno_vold";
constexpr int kVolumeDaemonSeconds = 10;
// Stands for an absent credential, as the decryption library has it.
constexpr char kNoCredential[] = "~";
constexpr int32_t kFailure = -1;

// Tells the rest of the rescue environment how an attempt ended; returns the operation's result.
int32_t publish_result(bool unlocked) {
  SetProperty("recovery.crypto.decrypt.result", unlocked ? "success" : "fail");
  return unlocked ? 0 : kFailure;
}

// The message names user 0 whoever is unlocked; field tools look for it as it stands.
bool unlock_without_credential(int user_id) {
  fprintf(stdout, "[%s]I: [FBE] password isn't enable. Decrypt the CE data of user 0 directly\n",
          kTag);
  if (Decrypt_User(user_id, kNoCredential, false)) {
    return true;
  }
  fprintf(stdout, "[%s]E: [FBE] Fail to decrypt CE data.\n", kTag);
  return false;
}

// Also unlocks what a credential would lock, where none is set.
bool unlock_device_encrypted(int user_id) {
  if (!Decrypt_DE()) {
    fprintf(stdout, "[%s]E: [FBE] Fail to decrypt DE data.\n", kTag);
    return false;
  }
  sentrova::OwnerGuardManager manager;
  if (manager->getLockStatus() == 0) {
    return unlock_without_credential(user_id);
  }
  fprintf(stdout, "[%s]I: [FBE] password is enable. Decrypt CE data when verify password\n", kTag);
  return true;
}

}  // namespace

int32_t SentrovaService::fdeDecryptUser(int /*userId*/) {
  const pid_t pid = ZunoFunc::Exec_Cmd(std::vector<std::string>{kVolumeDaemon});
  int status = 0;
  // The daemon's exit code does not count: only a signal, the time-out or a failed wait is a
  // failure.
  const bool ended =
      ZunoFunc::Wait_For_Child_Timeout(pid, &status, kVolumeDaemon, kVolumeDaemonSeconds) == 0;
  fprintf(stdout, "[%s]I: [FDE] %s to execute %s ...\n\n", kTag, ended ? "Success" : "Fail",
          kVolumeDaemon);
  return publish_result(ended);
}

int32_t SentrovaService::fbeDecryptMetadata() {
  fprintf(stdout, "[%s]I: [FBE] Starting keystore...\n", kTag);
  SetProperty("ctl.start", "keystore2");
  const auto* entry = volume_for_mount_point(kDataMountPoint);
  if (entry == nullptr) {
    fprintf(stdout, "[%s]E: [FBE] Fail to find /data entry in fstab\n", kTag);
    return kFailure;
  }
  if (!should_use_metadata_encryption(*entry)) {
    // Says the opposite of what it means; field tools look for it as it stands.
    fprintf(stdout, "[%s]I: [FBE] metadata encryption is define, Skip decrypt metadata\n", kTag);
    return 0;
  }
  return publish_result(Decrypt_ME());
}

int32_t SentrovaService::fbeDecryptUserDe(int userId) {
  const int mount_result = zuno_fs_mgr_do_mount_one(kDataMountPoint);
  if (mount_result != 0) {
    fprintf(stdout, "[%s]E: %s fail to do mount data result is %d!!!\n", kTag, "fbeDecryptUserDe",
            mount_result);
    return mount_result;
  }
  return publish_result(unlock_device_encrypted(userId));
}

int32_t SentrovaService::fbeDecryptUserCe(int userId, std::string password, bool flag) {
  const sentrova::WipeOnExit wipe_password(password);
  sentrova::OwnerGuardManager manager;
  if (!manager->verifyPassword(password)) {
    return kFailure;
  }
  fprintf(stdout, "[%s]I: [FBE] password verify pass, start decrypt ce for user %d\n", kTag,
          userId);
  if (Decrypt_User(userId, password, flag)) {
    return 0;
  }
  fprintf(stdout, "[%s]E: [FBE] fail to decrypt user %s ce\n", kTag,
          std::to_string(userId).c_str());
  return kFailure;
}

}  // namespace android
