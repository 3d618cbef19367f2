#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/linux/binder/driver.h"

namespace sentrova::binder {

// A client with its own connection to the kernel's driver that sends whatever it is given, however
// malformed. For tests. One thread.
class RawClient {
 public:
  struct Answer {
    uint32_t command = 0;  // BR_REPLY or how the call failed; 0: the driver itself failed
    bool is_status = false;
    uint32_t handle = 0;  // of the first object in the reply, which the client keeps
  };

  RawClient() : driver_(open_kernel_driver("/dev/binder")) {}
  bool ok() const { return driver_ != nullptr; }

  // Calls `handle` and waits for the answer. Large sizes beside small data are sent as they are.
  Answer call(uint32_t handle, uint32_t code, const std::string& data,
              const std::vector<uint64_t>& offsets = {});

 private:
  Answer take(const binder_transaction_data& transaction);
  void answer_reference(uint32_t command, const char* payload);
  void write(const std::string& commands);

  const std::unique_ptr<Driver> driver_;
};

}  // namespace sentrova::binder
