#include <libdm/dm_table.h>

#include <limits>

namespace android::dm {

bool DmTable::AddTarget(std::unique_ptr<DmTarget> target) {
  const bool usable = target != nullptr && target->size() != 0 && target->Valid();
  all_usable_ = all_usable_ && usable;
  if (usable) {
    targets_.push_back(std::move(target));
  }
  return usable;
}

bool DmTable::valid() const {
  uint64_t next_start = 0;
  for (const auto& target : targets_) {
    if (target->start() != next_start ||
        target->size() > std::numeric_limits<uint64_t>::max() - next_start) {
      return false;
    }
    next_start += target->size();
  }
  return all_usable_ && !targets_.empty();
}

uint64_t DmTable::num_sectors() const {
  return valid() ? targets_.back()->start() + targets_.back()->size() : 0;
}

}  // namespace android::dm
