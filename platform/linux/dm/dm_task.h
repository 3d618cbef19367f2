#pragma once

#include <libdevmapper.h>
#include <libdm/dm_table.h>

#include <memory>
#include <mutex>
#include <optional>
#include <string>

namespace sentrova::dm {

// A turn at libdevmapper, which works with process-wide state: one thread at a time, and the
// control device's descriptor, which is not close-on-exec, open only for the turn. Keeps `errno`.
class LibraryTurn {
 public:
  LibraryTurn();
  ~LibraryTurn();
  LibraryTurn(const LibraryTurn&) = delete;
  LibraryTurn& operator=(const LibraryTurn&) = delete;

 private:
  const std::lock_guard<std::mutex> lock_;
};

// One request to the kernel's device mapper for the device `name`; use it within a LibraryTurn.
// Every function returns false with `errno` when the request cannot be made or the kernel refuses
// it.
class DmTask {
 public:
  DmTask(int type, const std::string& name);

  // For DM_DEVICE_RELOAD. The parameters are wiped everywhere after use, for they may hold keys.
  bool set_table(const android::dm::DmTable& table);
  bool run();
  // After run(): what the kernel says about the device, or nothing.
  std::optional<dm_info> info();

 private:
  struct Destroy {
    void operator()(dm_task* task) const { dm_task_destroy(task); }
  };
  std::unique_ptr<dm_task, Destroy> task_;
};

}  // namespace sentrova::dm
