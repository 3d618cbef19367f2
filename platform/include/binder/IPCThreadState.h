#pragma once

#include <sys/types.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>

#include <memory>
#include <vector>

#include "common/export.h"

struct binder_transaction_data;

namespace sentrova::binder {
class CommandReader;
class CommandWriter;
class Driver;
}  // namespace sentrova::binder

namespace android {

class BBinder;
class Parcel;

// A thread's conversation with the binder driver. Made on the thread's first use and ended with the
// thread; only that thread may call its functions.
class SENTROVA_API IPCThreadState {
 public:
  // The calling thread's; null only while the thread ends, after its own was taken down.
  static IPCThreadState* self();

  // Calls the object behind `handle`, serving calls that come back meanwhile. Statuses as for
  // IBinder::transact. `reply` may be null.
  status_t transact(int32_t handle, uint32_t code, const Parcel& data, Parcel* reply,
                    uint32_t flags);

  // Serves calls on this thread until the driver is gone or keeps failing; in practice for the life
  // of the process. `is_main` is false for a thread that the driver asked for.
  void joinThreadPool(bool is_main = true);

  // Hands all waiting commands to the driver now.
  void flushCommands();

  // Who makes the call that this thread serves; this process itself when it serves none. The
  // process id is 0 for a one-way call.
  pid_t getCallingPid() const { return calling_pid_; }
  uid_t getCallingUid() const { return calling_uid_; }

  // The object that serves the calls to the context manager, if this process is it.
  void setTheContextObject(const sp<BBinder>& object);

  ~IPCThreadState();

 private:
  // What the driver asks to let go of or to announce. Done only when no call is under way on the
  // thread, because a destructor or a recipient may make calls of its own.
  struct Deferred {
    enum class Kind { kReleaseStrong, kReleaseWeak, kObituary } kind;
    uint64_t subject;  // the object, its weak reference, or the notification's cookie
  };
  // What a wait for the driver's answer is for.
  enum class Wanted { kCompletion, kReply };

  IPCThreadState();
  IPCThreadState(const IPCThreadState&) = delete;
  IPCThreadState& operator=(const IPCThreadState&) = delete;

  static void release_buffer(const uint8_t* data);

  sentrova::binder::CommandWriter& writer();
  status_t talk_with_driver(bool receive);
  status_t exchange(sentrova::binder::Driver* driver, bool receive);
  void flush_if_idle();
  void put_transaction(uint32_t command, uint32_t flags, int32_t handle, uint32_t code,
                       const Parcel& data, const status_t* status);
  status_t wait_for_answer(Wanted wanted, Parcel* reply);
  status_t take_reply(Parcel* reply);
  status_t next_command(uint32_t* command);
  status_t broken_input();
  status_t execute(uint32_t command);
  status_t execute_reference(uint32_t command);
  status_t execute_death();
  status_t execute_transaction();
  status_t serve(const binder_transaction_data& transaction, Parcel* reply);
  status_t adopt_buffer(const binder_transaction_data& transaction, Parcel* parcel);
  void send_reply(const Parcel& reply, status_t status);
  void run_deferred();
  void run(const Deferred& item);

  const sp<class ProcessState> process_;
  const std::unique_ptr<sentrova::binder::CommandWriter> out_;
  const std::unique_ptr<sentrova::binder::CommandReader> in_;
  std::vector<Deferred> deferred_;
  pid_t calling_pid_;
  uid_t calling_uid_;
  int calls_under_way_ = 0;  // made or served, nested ones included
  bool is_looper_ = false;
};

}  // namespace android
