// What a thread does with each of the driver's returns.
#include <linux/android/binder.h>

#include "binder/BpBinder.h"
#include "binder/IPCThreadState.h"
#include "binder/Parcel.h"
#include "binder/ProcessState.h"
#include "platform/linux/binder/commands.h"
#include "platform/linux/binder/log.h"
#include "platform/linux/binder/process_context.h"

namespace android {
namespace {

using sentrova::binder::Driver;

template <typename T>
T* pointer(binder_uintptr_t value) {
  return reinterpret_cast<T*>(static_cast<uintptr_t>(value));
}

// Whether [address, address + size) is an aligned part of `area`.
bool lies_in(std::span<const uint8_t> area, binder_uintptr_t address, binder_size_t size) {
  const auto begin = reinterpret_cast<uintptr_t>(area.data());
  return address >= begin && address - begin <= area.size() &&
         size <= area.size() - (address - begin) && address % sizeof(binder_uintptr_t) == 0;
}

bool is_believable(std::span<const uint8_t> area, const binder_transaction_data& transaction) {
  const auto& ptr = transaction.data.ptr;
  return lies_in(area, ptr.buffer, transaction.data_size) &&
         transaction.offsets_size % sizeof(binder_size_t) == 0 &&
         (transaction.offsets_size == 0 || lies_in(area, ptr.offsets, transaction.offsets_size));
}

}  // namespace

void IPCThreadState::release_buffer(const uint8_t* data) {
  const auto address = reinterpret_cast<binder_uintptr_t>(data);
  if (IPCThreadState* const thread = self(); thread != nullptr) {
    thread->writer().put(BC_FREE_BUFFER, address);
    thread->flush_if_idle();
    return;
  }
  Driver* const driver = ProcessState::self()->context().driver;
  if (driver == nullptr)
    return;
  sentrova::binder::CommandWriter commands;
  commands.put(BC_FREE_BUFFER, address);
  sentrova::binder::write_commands(*driver, commands.data(), commands.size());
  sentrova::binder::note_driver_use(*driver);
}

status_t IPCThreadState::adopt_buffer(const binder_transaction_data& transaction, Parcel* parcel) {
  Driver* const driver = process_->context().driver;
  if (driver == nullptr)
    return NO_INIT;
  const auto& ptr = transaction.data.ptr;
  const std::span<const uint8_t> area = driver->receive_area();
  const auto* const data = pointer<const uint8_t>(ptr.buffer);
  const bool sound =
      is_believable(area, transaction) &&
      parcel->take_received(data, transaction.data_size, pointer<const uint64_t>(ptr.offsets),
                            transaction.offsets_size / sizeof(binder_size_t), release_buffer) == OK;
  if (sound) {
    if ((transaction.flags & TF_CLEAR_BUF) != 0)
      parcel->markSensitive();
    return OK;
  }
  BINDER_LOGE("the driver delivers an unsound parcel");
  if (lies_in(area, ptr.buffer, 0))
    release_buffer(data);
  return BAD_VALUE;
}

status_t IPCThreadState::take_reply(Parcel* reply) {
  binder_transaction_data transaction;
  if (!in_->read(&transaction))
    return broken_input();
  const bool is_status = (transaction.flags & TF_STATUS_CODE) != 0;
  Parcel unwanted;
  Parcel* const taker = is_status || reply == nullptr ? &unwanted : reply;
  const status_t status = adopt_buffer(transaction, taker);
  if (status != OK || !is_status)
    return status;
  int32_t answer;
  const status_t read_status = taker->readInt32(&answer);
  if (read_status != OK)
    return read_status;
  return answer > 0 ? UNKNOWN_ERROR : answer;  // statuses are negative
}

status_t IPCThreadState::execute(uint32_t command) {
  switch (command) {
    case BR_TRANSACTION:
      return execute_transaction();
    case BR_REPLY:
      // Nobody waits for it any more.
      take_reply(nullptr);
      return OK;
    case BR_INCREFS:
    case BR_ACQUIRE:
    case BR_RELEASE:
    case BR_DECREFS:
      return execute_reference(command);
    case BR_DEAD_BINDER:
      return execute_death();
    case BR_SPAWN_LOOPER:
      process_->spawnPooledThread(false);
      return OK;
    case BR_ERROR: {
      int32_t error;
      if (!in_->read(&error))
        return broken_input();
      return error < 0 ? error : UNKNOWN_ERROR;
    }
    default:
      // BR_NOOP, BR_OK, BR_CLEAR_DEATH_NOTIFICATION_DONE, answers to calls that were given up, and
      // what later drivers may say: a command's number holds the size of what follows it.
      return in_->skip(_IOC_SIZE(command)) ? OK : broken_input();
  }
}

status_t IPCThreadState::execute_reference(uint32_t command) {
  binder_ptr_cookie object;
  if (!in_->read(&object))
    return broken_input();
  // The context manager's own object is known to the driver as null.
  const bool is_null = object.ptr == 0 || object.cookie == 0;
  switch (command) {
    case BR_INCREFS:
      if (!is_null)
        pointer<RefBase::weakref_type>(object.ptr)->incWeak(process_.get());
      writer().put(BC_INCREFS_DONE, object);
      break;
    case BR_ACQUIRE:
      if (!is_null)
        pointer<IBinder>(object.cookie)->incStrong(process_.get());
      writer().put(BC_ACQUIRE_DONE, object);
      break;
    case BR_RELEASE:
      if (!is_null)
        deferred_.push_back({Deferred::Kind::kReleaseStrong, object.cookie});
      break;
    default:
      if (!is_null)
        deferred_.push_back({Deferred::Kind::kReleaseWeak, object.ptr});
  }
  return OK;
}

status_t IPCThreadState::execute_death() {
  binder_uintptr_t cookie;
  if (!in_->read(&cookie))
    return broken_input();
  deferred_.push_back({Deferred::Kind::kObituary, cookie});
  return OK;
}

void IPCThreadState::run_deferred() {
  while (!deferred_.empty()) {
    std::vector<Deferred> now;
    now.swap(deferred_);
    for (const Deferred& item : now)
      run(item);
  }
}

void IPCThreadState::run(const Deferred& item) {
  switch (item.kind) {
    case Deferred::Kind::kReleaseStrong:
      pointer<IBinder>(item.subject)->decStrong(process_.get());
      break;
    case Deferred::Kind::kReleaseWeak:
      pointer<RefBase::weakref_type>(item.subject)->decWeak(process_.get());
      break;
    case Deferred::Kind::kObituary: {
      const sp<BpBinder> proxy = process_->context().proxies.take_death(item.subject);
      if (proxy != nullptr)
        proxy->sendObituary();
      const binder_uintptr_t cookie = item.subject;
      writer().put(BC_DEAD_BINDER_DONE, cookie);
      break;
    }
  }
}

status_t IPCThreadState::execute_transaction() {
  binder_transaction_data transaction;
  if (!in_->read(&transaction))
    return broken_input();
  const pid_t outer_pid = calling_pid_;
  const uid_t outer_uid = calling_uid_;
  calling_pid_ = transaction.sender_pid;
  calling_uid_ = transaction.sender_euid;
  ++calls_under_way_;
  {
    Parcel reply;
    const status_t status = serve(transaction, &reply);
    if ((transaction.flags & TF_ONE_WAY) == 0) {
      send_reply(reply, status);
    }
  }
  --calls_under_way_;
  calling_pid_ = outer_pid;
  calling_uid_ = outer_uid;
  return OK;
}

// The request goes back to the driver here, before the reply: both travel in one exchange.
status_t IPCThreadState::serve(const binder_transaction_data& transaction, Parcel* reply) {
  Parcel data;
  const status_t status = adopt_buffer(transaction, &data);
  if (status != OK)
    return status;
  if (transaction.target.ptr == 0) {
    const sp<BBinder> object = process_->context().context_object;
    if (object == nullptr)
      return UNKNOWN_TRANSACTION;
    return object->transact(transaction.code, data, reply, transaction.flags);
  }
  if (!pointer<RefBase::weakref_type>(transaction.target.ptr)->attemptIncStrong(this)) {
    return DEAD_OBJECT;
  }
  auto* const object = pointer<IBinder>(transaction.cookie);
  const status_t answer = object->transact(transaction.code, data, reply, transaction.flags);
  object->decStrong(this);
  return answer;
}

}  // namespace android
