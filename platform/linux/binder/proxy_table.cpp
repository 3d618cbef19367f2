#include "platform/linux/binder/proxy_table.h"

#include <errno.h>
#include <string.h>

#include <algorithm>

#include "platform/linux/binder/commands.h"
#include "platform/linux/binder/driver.h"
#include "platform/linux/binder/log.h"
#include "platform/linux/binder/process_context.h"

namespace sentrova::binder {

using android::BpBinder;
using android::sp;
using android::status_t;

int ProxyTable::write(const void* commands, size_t size) {
  Driver* const driver = driver_;
  if (driver == nullptr)
    return android::NO_INIT;
  const int result = write_commands(*driver, commands, size);
  note_driver_use(*driver);
  if (result != 0)
    BINDER_LOGE("cannot write reference commands: %s", strerror(-result));
  return result;
}

int ProxyTable::acquire(int32_t handle) {
  CommandWriter commands;
  commands.put(BC_INCREFS, handle);
  commands.put(BC_ACQUIRE, handle);
  return write(commands.data(), commands.size());
}

void ProxyTable::give_back(int32_t handle, const Entry& entry) {
  CommandWriter commands;
  if (entry.death_cookie != 0)
    commands.put(BC_CLEAR_DEATH_NOTIFICATION, handle, entry.death_cookie);
  commands.put(BC_RELEASE, handle);
  commands.put(BC_DECREFS, handle);
  write(commands.data(), commands.size());
}

int ProxyTable::write_death_command(uint32_t command, int32_t handle, uint64_t cookie) {
  CommandWriter commands;
  commands.put(command, handle, cookie);
  return write(commands.data(), commands.size());
}

sp<BpBinder> ProxyTable::find_or_make(int32_t handle) {
  if (driver_ == nullptr)
    return nullptr;
  sp<BpBinder> former;  // let go of without the lock, which its release takes
  const std::lock_guard guard(lock_);
  auto found = entries_.find(handle);
  if (found != entries_.end()) {
    former = found->second.proxy.promote();
    const bool dead_manager = handle == kContextManagerHandle &&
                              (former == nullptr ? found->second.dead : !former->isBinderAlive());
    if (former != nullptr && !dead_manager)
      return former;
    if (dead_manager) {
      give_back(handle, found->second);
      entries_.erase(found);
      found = entries_.end();
    }
  }
  if (found == entries_.end() && acquire(handle) != 0)
    return nullptr;
  const bool dead = found != entries_.end() && found->second.dead;
  const sp<BpBinder> proxy = new BpBinder(handle, !dead);
  Entry& entry = entries_[handle];
  entry.proxy = proxy;
  entry.identity = proxy.get();
  return proxy;
}

void ProxyTable::release(int32_t handle, const BpBinder* proxy) {
  if (driver_ == nullptr)
    return;
  const std::lock_guard guard(lock_);
  const auto found = entries_.find(handle);
  if (found == entries_.end() || found->second.identity != proxy)
    return;
  give_back(handle, found->second);
  entries_.erase(found);
}

status_t ProxyTable::request_death(int32_t handle) {
  if (driver_ == nullptr)
    return android::NO_INIT;
  const std::lock_guard guard(lock_);
  const auto found = entries_.find(handle);
  if (found == entries_.end())
    return android::NAME_NOT_FOUND;
  if (found->second.dead)
    return android::DEAD_OBJECT;
  if (found->second.death_cookie != 0)
    return android::OK;
  const uint64_t cookie = ++last_cookie_;
  const int result = write_death_command(BC_REQUEST_DEATH_NOTIFICATION, handle, cookie);
  if (result == 0)
    found->second.death_cookie = cookie;
  return result;
}

void ProxyTable::clear_death(int32_t handle) {
  if (driver_ == nullptr)
    return;
  const std::lock_guard guard(lock_);
  const auto found = entries_.find(handle);
  if (found == entries_.end() || found->second.death_cookie == 0 || found->second.dead)
    return;
  write_death_command(BC_CLEAR_DEATH_NOTIFICATION, handle, found->second.death_cookie);
  found->second.death_cookie = 0;
}

sp<BpBinder> ProxyTable::take_death(uint64_t cookie) {
  const std::lock_guard guard(lock_);
  const auto found = std::find_if(entries_.begin(), entries_.end(), [cookie](const auto& entry) {
    return cookie != 0 && entry.second.death_cookie == cookie;
  });
  if (found == entries_.end())
    return nullptr;
  found->second.dead = true;
  return found->second.proxy.promote();
}

}  // namespace sentrova::binder
