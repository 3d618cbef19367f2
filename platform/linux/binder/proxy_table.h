#pragma once

#include <stdint.h>
#include <utils/RefBase.h>

#include <atomic>
#include <mutex>
#include <unordered_map>

#include "binder/BpBinder.h"
#include "common/export.h"

namespace sentrova::binder {

class Driver;

// The handle of the context manager, whichever process is it (linux/android/binder.h).
inline constexpr int32_t kContextManagerHandle = 0;

// The proxies of a process, one for each handle, and what the driver counts for them: one strong
// and one weak reference, and at most one death notification, for each handle in the table.
//
// All commands about a handle are written while the table's lock is held, so the driver sees them
// in the table's order. A proxy whose last reference goes while its handle is looked up again
// leaves its entry, references and notification included, to its successor. Safe on all threads.
class SENTROVA_API ProxyTable {
 public:
  // `driver` may be null, in which case there are no proxies; it must outlive the table.
  explicit ProxyTable(Driver* driver) : driver_(driver) {}

  // The proxy of `handle`. Null without a driver or when it refuses the references. A dead context
  // manager's proxy is not handed out again: its handle is its successor's, and so are new
  // references.
  android::sp<android::BpBinder> find_or_make(int32_t handle);

  // Gives the handle back to the driver, if `proxy`, which is about to be destroyed and is not
  // followed, still has it.
  void release(int32_t handle, const android::BpBinder* proxy);

  // Asks for the death notification, if it is not asked for yet. OK or the driver's error.
  android::status_t request_death(int32_t handle);
  // Takes the request back, if there is one and the death has not been announced.
  void clear_death(int32_t handle);
  // The proxy whose notification carries `cookie`, from now on known as dead. Null if there is
  // none.
  android::sp<android::BpBinder> take_death(uint64_t cookie);

  // In a child after fork: the driver belongs to the parent, and the lock may be held for ever.
  void abandon() { driver_ = nullptr; }

 private:
  struct Entry {
    android::wp<android::BpBinder> proxy;
    const android::BpBinder* identity;  // tells the proxy from its successor; never followed
    uint64_t death_cookie = 0;          // 0: not asked for
    bool dead = false;
  };
  using Entries = std::unordered_map<int32_t, Entry>;

  int write(const void* commands, size_t size);
  int acquire(int32_t handle);
  void give_back(int32_t handle, const Entry& entry);
  int write_death_command(uint32_t command, int32_t handle, uint64_t cookie);

  std::atomic<Driver*> driver_;
  std::mutex lock_;
  Entries entries_;
  uint64_t last_cookie_ = 0;  // never used twice, so a late notification meets no stranger
};

}  // namespace sentrova::binder
