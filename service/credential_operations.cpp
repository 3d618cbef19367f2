#include <array>
#include <cstdint>
#include <string>

#include "common/wipe.h"
#include "service/owner_guard_manager.h"
#include "service/sentrova_service.h"

namespace android {
namespace {

// Credential-type codes by lock status, as the credential library and the clients agree on them.
constexpr std::array<int32_t, 6> kCredentialTypes = {0, 11, 12, 13, 2, 3};
constexpr int32_t kFailure = -1;

}  // namespace

int32_t SentrovaService::getUserPassWordType(int /*userId*/) {
  sentrova::OwnerGuardManager manager;
  const auto lock_status = static_cast<uint32_t>(manager->getLockStatus());
  return lock_status < kCredentialTypes.size() ? kCredentialTypes[lock_status] : kFailure;
}

int32_t SentrovaService::verifyUserPassWord(int /*userId*/, std::string password) {
  const sentrova::WipeOnExit wipe_password(password);
  sentrova::OwnerGuardManager manager;
  return manager->verifyPassword(password) ? 0 : kFailure;
}

}  // namespace android
