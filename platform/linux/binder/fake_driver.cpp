#include "platform/linux/binder/fake_driver.h"

#include <errno.h>

#include <algorithm>
#include <utility>

namespace sentrova::binder {
namespace {

const uint8_t* bytes_at(binder_uintptr_t address) {
  return reinterpret_cast<const uint8_t*>(static_cast<uintptr_t>(address));
}

}  // namespace

void FakeDriver::restart() {
  const std::lock_guard guard(lock_);
  reader_ = std::this_thread::get_id();
  script_.clear();
  written_.clear();
  breaches_.clear();
  threads_ended_ = 0;
  miscount_ = false;
  area_used_ = 0;
}

int FakeDriver::exit_thread() {
  const std::lock_guard guard(lock_);
  ++threads_ended_;
  return 0;
}

int FakeDriver::write_read(binder_write_read* exchange) {
  const std::lock_guard guard(lock_);
  parse(bytes_at(exchange->write_buffer) + exchange->write_consumed,
        exchange->write_size - exchange->write_consumed);
  exchange->write_consumed = exchange->write_size;
  if (std::exchange(miscount_, false))
    exchange->read_consumed = exchange->read_size + 1;
  if (exchange->read_size == 0 || exchange->read_consumed != 0)
    return 0;
  if (std::this_thread::get_id() != reader_ || script_.empty())
    return -EBADF;
  const Step step = script_.front();
  script_.pop_front();
  memcpy(reinterpret_cast<void*>(static_cast<uintptr_t>(exchange->read_buffer)), step.bytes.data(),
         step.bytes.size());
  exchange->read_consumed = step.bytes.size();
  return step.error;
}

void FakeDriver::parse(const uint8_t* bytes, size_t size) {
  while (size >= sizeof(uint32_t)) {
    WrittenCommand command = {};
    memcpy(&command.code, bytes, sizeof(command.code));
    const size_t payload_size = _IOC_SIZE(command.code);
    if (payload_size > size - sizeof(command.code))
      break;
    command.payload.assign(reinterpret_cast<const char*>(bytes) + sizeof(command.code),
                           payload_size);
    if (command.code == BC_TRANSACTION || command.code == BC_REPLY) {
      const auto sent = command.as<binder_transaction_data>();
      command.data.assign(reinterpret_cast<const char*>(bytes_at(sent.data.ptr.buffer)),
                          sent.data_size);
      command.offsets.resize(sent.offsets_size / sizeof(uint64_t));
      if (sent.offsets_size != 0) {
        memcpy(command.offsets.data(), bytes_at(sent.data.ptr.offsets), sent.offsets_size);
      }
    }
    count(command);
    written_.push_back(command);
    bytes += sizeof(command.code) + payload_size;
    size -= sizeof(command.code) + payload_size;
  }
  if (size != 0)
    breaches_.push_back("half a command");
}

void FakeDriver::count(const WrittenCommand& command) {
  HandleState& handle = handles_[command.as<uint32_t>()];
  switch (command.code) {
    case BC_INCREFS:
      ++handle.weak;
      break;
    case BC_ACQUIRE:
      ++handle.strong;
      break;
    case BC_RELEASE:
      if (--handle.strong < 0)
        breaches_.push_back("a strong reference too many let go");
      break;
    case BC_DECREFS:
      if (--handle.weak < 0)
        breaches_.push_back("a weak reference too many let go");
      if (handle.death_cookie != 0)
        breaches_.push_back("let go with a death notification");
      break;
    case BC_REQUEST_DEATH_NOTIFICATION:
    case BC_CLEAR_DEATH_NOTIFICATION:
      count_death(command);
      break;
    default:
      break;
  }
}

void FakeDriver::count_death(const WrittenCommand& command) {
  const auto named = command.as<binder_handle_cookie>();
  HandleState& handle = handles_[named.handle];
  if (handle.weak == 0)
    breaches_.push_back("a death notification without a reference");
  if (command.code == BC_REQUEST_DEATH_NOTIFICATION) {
    if (handle.death_cookie != 0)
      breaches_.push_back("a second death notification");
    handle.death_cookie = named.cookie;
  } else {
    if (handle.death_cookie != named.cookie)
      breaches_.push_back("another death cookie cleared");
    handle.death_cookie = 0;
  }
}

binder_transaction_data FakeDriver::deliver(const std::string& data,
                                            const std::vector<uint64_t>& offsets) {
  const std::lock_guard guard(lock_);
  binder_transaction_data delivered = {};
  uint8_t* const place = area_ + area_used_;
  const size_t data_room = (data.size() + 7) / 8 * 8;
  const size_t offsets_size = offsets.size() * sizeof(uint64_t);
  std::copy(data.begin(), data.end(), place);
  if (!offsets.empty())
    memcpy(place + data_room, offsets.data(), offsets_size);
  area_used_ += data_room + offsets_size + 8;
  delivered.data_size = data.size();
  delivered.offsets_size = offsets_size;
  delivered.data.ptr.buffer = reinterpret_cast<uintptr_t>(place);
  delivered.data.ptr.offsets = reinterpret_cast<uintptr_t>(place + data_room);
  return delivered;
}

void FakeDriver::add_reply(const std::string& data, const std::vector<uint64_t>& offsets,
                           uint32_t flags) {
  binder_transaction_data answer = deliver(data, offsets);
  answer.flags = flags;
  add_step(returned(BR_NOOP) + returned(BR_TRANSACTION_COMPLETE));
  add_step(returned(BR_NOOP) + returned(BR_REPLY, answer));
}

std::vector<WrittenCommand> FakeDriver::written() const {
  const std::lock_guard guard(lock_);
  return written_;
}

std::vector<WrittenCommand> FakeDriver::written(uint32_t code) const {
  std::vector<WrittenCommand> some = written();
  std::erase_if(some, [code](const WrittenCommand& command) { return command.code != code; });
  return some;
}

std::vector<uint32_t> FakeDriver::codes() const {
  std::vector<uint32_t> all;
  for (const WrittenCommand& command : written())
    all.push_back(command.code);
  return all;
}

std::map<uint32_t, FakeDriver::HandleState> FakeDriver::handles() const {
  const std::lock_guard guard(lock_);
  return handles_;
}

std::vector<std::string> FakeDriver::breaches() const {
  const std::lock_guard guard(lock_);
  return breaches_;
}

int FakeDriver::threads_ended() const {
  const std::lock_guard guard(lock_);
  return threads_ended_;
}

}  // namespace sentrova::binder
