#include "platform/linux/binder/raw_client.h"

#include <errno.h>
#include <string.h>

namespace sentrova::binder {
namespace {

template <typename... Payload>
std::string command_bytes(uint32_t command, const Payload&... payload) {
  std::string bytes(reinterpret_cast<const char*>(&command), sizeof(command));
  (bytes.append(reinterpret_cast<const char*>(&payload), sizeof(payload)), ...);
  return bytes;
}

template <typename T>
T copied(const char* bytes) {
  T value;
  memcpy(&value, bytes, sizeof(value));
  return value;
}

}  // namespace

void RawClient::write(const std::string& commands) {
  write_commands(*driver_, commands.data(), commands.size());
}

void RawClient::answer_reference(uint32_t command, const char* payload) {
  const auto object = copied<binder_ptr_cookie>(payload);
  if (command == BR_INCREFS)
    write(command_bytes(BC_INCREFS_DONE, object));
  if (command == BR_ACQUIRE)
    write(command_bytes(BC_ACQUIRE_DONE, object));
}

RawClient::Answer RawClient::take(const binder_transaction_data& transaction) {
  Answer answer;
  answer.command = BR_REPLY;
  answer.is_status = (transaction.flags & TF_STATUS_CODE) != 0;
  const auto* const data = reinterpret_cast<const char*>(transaction.data.ptr.buffer);
  if (transaction.offsets_size != 0) {
    const auto offset =
        copied<uint64_t>(reinterpret_cast<const char*>(transaction.data.ptr.offsets));
    answer.handle = copied<flat_binder_object>(data + offset).handle;
    write(command_bytes(BC_INCREFS, answer.handle) + command_bytes(BC_ACQUIRE, answer.handle));
  }
  write(command_bytes(BC_FREE_BUFFER, transaction.data.ptr.buffer));
  return answer;
}

RawClient::Answer RawClient::call(uint32_t handle, uint32_t code, const std::string& data,
                                  const std::vector<uint64_t>& offsets) {
  binder_transaction_data transaction = {};
  transaction.target.handle = handle;
  transaction.code = code;
  transaction.flags = TF_ACCEPT_FDS;
  transaction.data_size = data.size();
  transaction.data.ptr.buffer = reinterpret_cast<uintptr_t>(data.data());
  transaction.offsets_size = offsets.size() * sizeof(uint64_t);
  transaction.data.ptr.offsets = reinterpret_cast<uintptr_t>(offsets.data());
  std::string commands = command_bytes(BC_TRANSACTION, transaction);
  while (true) {
    char returned[512];
    binder_write_read exchange = {};
    exchange.write_buffer = reinterpret_cast<uintptr_t>(commands.data());
    exchange.write_size = commands.size();
    exchange.read_buffer = reinterpret_cast<uintptr_t>(returned);
    exchange.read_size = sizeof(returned);
    int result;
    do {
      result = driver_->write_read(&exchange);
    } while (result == -EINTR);
    if (result != 0)
      return {};
    commands.clear();
    for (size_t at = 0; at < exchange.read_consumed;) {
      const auto command = copied<uint32_t>(returned + at);
      const char* const payload = returned + at + sizeof(command);
      at += sizeof(command) + _IOC_SIZE(command);
      if (command == BR_REPLY)
        return take(copied<binder_transaction_data>(payload));
      if (command == BR_FAILED_REPLY || command == BR_DEAD_REPLY)
        return {command, false, 0};
      if (command == BR_INCREFS || command == BR_ACQUIRE)
        answer_reference(command, payload);
    }
  }
}

}  // namespace sentrova::binder
