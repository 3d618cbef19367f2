#pragma once

#include <cstdint>
#include <string>

#include "service/sentrova_service.h"

namespace sentrova::device {

// The rescue service, which tells on standard output how long each operation took and how much of
// that was spent in the vendor's libraries.
class TimedService : public android::SentrovaService {
 public:
  int32_t getUserPassWordType(int userId) override;
  int32_t verifyUserPassWord(int userId, std::string password) override;
  int32_t fdeDecryptUser(int userId) override;
  int32_t fbeDecryptMetadata() override;
  int32_t fbeDecryptUserDe(int userId) override;
  int32_t fbeDecryptUserCe(int userId, std::string password, bool flag) override;
};

}  // namespace sentrova::device
