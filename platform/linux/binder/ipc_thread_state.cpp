#include <errno.h>
#include <linux/android/binder.h>
#include <string.h>
#include <unistd.h>

#include "binder/IPCThreadState.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"
#include "platform/linux/binder/commands.h"
#include "platform/linux/binder/log.h"
#include "platform/linux/binder/process_context.h"

namespace android {
namespace {

using sentrova::binder::CommandWriter;
using sentrova::binder::Driver;

// How often in a row the driver may fail before a serving thread gives it up.
constexpr int kMostFailuresInARow = 10;
constexpr useconds_t kFirstPauseMicroseconds = 500;  // doubled with every failure

thread_local IPCThreadState* of_this_thread = nullptr;
thread_local bool thread_is_ending = false;

struct EndOfThread {
  ~EndOfThread() {
    thread_is_ending = true;
    delete of_this_thread;
    of_this_thread = nullptr;
  }
};

bool driver_is_gone(status_t status) {
  return status == -ECONNREFUSED || status == -EBADF || status == NO_INIT;
}

}  // namespace

IPCThreadState* IPCThreadState::self() {
  if (of_this_thread == nullptr && !thread_is_ending) {
    thread_local EndOfThread end_of_thread;
    static_cast<void>(end_of_thread);
    of_this_thread = new IPCThreadState();
  }
  return thread_is_ending ? nullptr : of_this_thread;
}

IPCThreadState::IPCThreadState()
    : process_(ProcessState::self()),
      out_(std::make_unique<sentrova::binder::CommandWriter>()),
      in_(std::make_unique<sentrova::binder::CommandReader>()),
      calling_pid_(getpid()),
      calling_uid_(getuid()) {}

IPCThreadState::~IPCThreadState() {
  flushCommands();
  Driver* const driver = process_->context().driver;
  if (driver != nullptr)
    driver->exit_thread();
}

void IPCThreadState::setTheContextObject(const sp<BBinder>& object) {
  process_->context().context_object = object;
}

CommandWriter& IPCThreadState::writer() {
  if (!out_->has_room())
    flushCommands();
  return *out_;
}

void IPCThreadState::flushCommands() {
  if (!out_->empty())
    talk_with_driver(false);
}

void IPCThreadState::flush_if_idle() {
  if (!is_looper_ && calls_under_way_ == 0)
    flushCommands();
}

status_t IPCThreadState::talk_with_driver(bool receive) {
  Driver* const driver = process_->context().driver;
  const status_t status = driver == nullptr ? NO_INIT : exchange(driver, receive);
  // What the driver refused once it would refuse each time.
  out_->clear();
  return status;
}

status_t IPCThreadState::exchange(Driver* driver, bool receive) {
  binder_write_read transfer = {};
  transfer.write_buffer = reinterpret_cast<uintptr_t>(out_->data());
  transfer.write_size = out_->size();
  transfer.read_buffer = reinterpret_cast<uintptr_t>(in_->room());
  transfer.read_size = receive ? in_->capacity() : 0;
  int result;
  do {
    result = driver->write_read(&transfer);
  } while (result == -EINTR);
  if (result != 0) {
    if (!driver_is_gone(result))
      BINDER_LOGE("the driver fails: %s", strerror(-result));
    return result;
  }
  if (transfer.write_consumed != transfer.write_size ||
      transfer.read_consumed > transfer.read_size) {
    BINDER_LOGE("the driver miscounts");
    return -EPROTO;
  }
  if (receive)
    in_->fill(transfer.read_consumed);
  return OK;
}

void IPCThreadState::put_transaction(uint32_t command, uint32_t flags, int32_t handle,
                                     uint32_t code, const Parcel& data, const status_t* status) {
  binder_transaction_data transaction = {};
  transaction.target.handle = static_cast<uint32_t>(handle);
  transaction.code = code;
  transaction.flags = flags | (data.isSensitive() ? TF_CLEAR_BUF : 0);
  if (status != nullptr) {
    transaction.flags |= TF_STATUS_CODE;
    transaction.data_size = sizeof(*status);
    transaction.data.ptr.buffer = reinterpret_cast<uintptr_t>(status);
  } else {
    transaction.data_size = data.data_size_;
    transaction.data.ptr.buffer = reinterpret_cast<uintptr_t>(data.data_);
    transaction.offsets_size = data.object_count_ * sizeof(binder_size_t);
    transaction.data.ptr.offsets = reinterpret_cast<uintptr_t>(data.objects_);
  }
  writer().put(command, transaction);
}

status_t IPCThreadState::transact(int32_t handle, uint32_t code, const Parcel& data, Parcel* reply,
                                  uint32_t flags) {
  if (data.errorCheck() != OK)
    return data.errorCheck();
  if (reply != nullptr)
    reply->freeData();
  const bool one_way = (flags & TF_ONE_WAY) != 0;
  ++calls_under_way_;
  put_transaction(BC_TRANSACTION, flags | TF_ACCEPT_FDS, handle, code, data, nullptr);
  const status_t status = wait_for_answer(one_way ? Wanted::kCompletion : Wanted::kReply, reply);
  --calls_under_way_;
  if (calls_under_way_ == 0) {
    run_deferred();
    flush_if_idle();
  }
  return status;
}

void IPCThreadState::send_reply(const Parcel& reply, status_t status) {
  if (status == OK)
    status = reply.errorCheck();
  put_transaction(BC_REPLY, 0, 0, 0, reply, status < 0 ? &status : nullptr);
  wait_for_answer(Wanted::kCompletion, nullptr);
}

status_t IPCThreadState::next_command(uint32_t* command) {
  const status_t status = in_->empty() ? talk_with_driver(true) : OK;
  if (status != OK)
    return status;
  return in_->read(command) ? OK : broken_input();
}

status_t IPCThreadState::broken_input() {
  BINDER_LOGE("the driver returns half a command");
  in_->clear();
  return UNKNOWN_ERROR;
}

status_t IPCThreadState::wait_for_answer(Wanted wanted, Parcel* reply) {
  while (true) {
    uint32_t command;
    status_t status = next_command(&command);
    if (status != OK)
      return status;
    switch (command) {
      case BR_TRANSACTION_COMPLETE:
      case BR_ONEWAY_SPAM_SUSPECT:
        if (wanted == Wanted::kCompletion)
          return OK;
        break;
      case BR_DEAD_REPLY:
        return DEAD_OBJECT;
      case BR_FAILED_REPLY:
      case BR_FROZEN_REPLY:
        return FAILED_TRANSACTION;
      case BR_REPLY:
        status = take_reply(reply);
        if (wanted == Wanted::kReply)
          return status;
        break;
      default:
        status = execute(command);
        if (status != OK)
          return status;
    }
  }
}

void IPCThreadState::joinThreadPool(bool is_main) {
  writer().put(is_main ? BC_ENTER_LOOPER : BC_REGISTER_LOOPER);
  is_looper_ = true;
  int failures = 0;
  status_t status = OK;
  while (!driver_is_gone(status) && failures < kMostFailuresInARow) {
    run_deferred();
    uint32_t command;
    status = next_command(&command);
    if (status == OK)
      status = execute(command);
    failures = status == OK ? 0 : failures + 1;
    if (failures > 0)
      usleep(kFirstPauseMicroseconds << failures);  // the driver may lack memory for a moment
  }
  is_looper_ = false;
  if (failures == kMostFailuresInARow)
    BINDER_LOGE("a serving thread gives the driver up");
  writer().put(BC_EXIT_LOOPER);
  flushCommands();
}

}  // namespace android
