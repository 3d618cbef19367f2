#include <cstdint>
#include <string>

#include "common/wipe.h"
#include "service/sentrova_service.h"

namespace android {

int32_t SentrovaService::fdeDecryptUser(int /*userId*/) {
  return -1;
}

int32_t SentrovaService::fbeDecryptMetadata() {
  return -1;
}

int32_t SentrovaService::fbeDecryptUserDe(int /*userId*/) {
  return -1;
}

int32_t SentrovaService::fbeDecryptUserCe(int /*userId*/, std::string password, bool /*flag*/) {
  sentrova::wipe(password);
  return -1;
}

}  // namespace android
