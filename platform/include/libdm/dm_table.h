#pragma once

#include <stdint.h>

#include <memory>
#include <utility>
#include <vector>

#include "common/export.h"
#include "libdm/dm_target.h"

namespace android::dm {

// The targets that make up one device, in order and without gaps.
class SENTROVA_API DmTable {
 public:
  // Appends a target. False, and the table no longer valid, when the target is not Valid().
  bool AddTarget(std::unique_ptr<DmTarget> target);

  template <typename Target, typename... Arguments>
  bool Emplace(Arguments&&... arguments) {
    return AddTarget(std::make_unique<Target>(std::forward<Arguments>(arguments)...));
  }

  // Whether there is a target, all of them are usable, and each begins where the one before ends.
  bool valid() const;

  // The size of the device in sectors of 512 bytes; 0 where the table is not valid.
  uint64_t num_sectors() const;

  void set_readonly(bool readonly) { readonly_ = readonly; }
  bool readonly() const { return readonly_; }

  const std::vector<std::unique_ptr<DmTarget>>& targets() const { return targets_; }

 private:
  std::vector<std::unique_ptr<DmTarget>> targets_;
  bool all_usable_ = true;
  bool readonly_ = false;
};

}  // namespace android::dm
