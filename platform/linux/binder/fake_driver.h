#pragma once

#include <stddef.h>
#include <stdint.h>
#include <string.h>

#include <deque>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "platform/linux/binder/driver.h"

namespace sentrova::binder {

// One command as this process wrote it, with a copy of what a transaction points to.
struct WrittenCommand {
  uint32_t code;
  std::string payload;
  std::string data;  // of BC_TRANSACTION and BC_REPLY
  std::vector<uint64_t> offsets;

  template <typename T>
  T as() const {
    T value = {};
    memcpy(&value, payload.data(), sizeof(value) < payload.size() ? sizeof(value) : payload.size());
    return value;
  }
};

// Plays the kernel: keeps what is written, answers the reads of the thread that made it from a
// script, and keeps count of handles the way the kernel does, noting every breach of its rules.
class FakeDriver : public Driver {
 public:
  // What the next read gives: bytes, or a negative errno.
  struct Step {
    std::string bytes;
    int error = 0;
  };
  struct HandleState {
    int strong = 0;
    int weak = 0;
    uint64_t death_cookie = 0;
  };

  int write_read(binder_write_read* exchange) override;
  int set_max_threads(uint32_t) override { return 0; }
  int become_context_manager() override { return -EBUSY; }
  int exit_thread() override;
  std::span<const uint8_t> receive_area() const override { return area_; }

  // Forgets everything but the counts of handles, and gives the script to the calling thread.
  void restart();

  void add_step(std::string bytes) { script_.push_back({std::move(bytes), 0}); }
  void add_error(int error) { script_.push_back({{}, error}); }
  bool script_is_over() const { return script_.empty(); }

  // A BR_ code with what follows it.
  template <typename... Payload>
  static std::string returned(uint32_t code, const Payload&... payload) {
    std::string bytes(reinterpret_cast<const char*>(&code), sizeof(code));
    (bytes.append(reinterpret_cast<const char*>(&payload), sizeof(payload)), ...);
    return bytes;
  }

  // A transaction of this process's receive area that holds `data` and `offsets`.
  binder_transaction_data deliver(const std::string& data,
                                  const std::vector<uint64_t>& offsets = {});
  // The usual three returns: nothing, the call is on its way, and its answer.
  void add_reply(const std::string& data, const std::vector<uint64_t>& offsets = {},
                 uint32_t flags = 0);

  // The written commands, those with `code` only, and their codes in order.
  std::vector<WrittenCommand> written() const;
  std::vector<WrittenCommand> written(uint32_t code) const;
  std::vector<uint32_t> codes() const;
  std::map<uint32_t, HandleState> handles() const;
  std::vector<std::string> breaches() const;
  int threads_ended() const;
  // Makes the driver claim another count of consumed bytes in its next exchange.
  void miscount_next() { miscount_ = true; }

 private:
  void parse(const uint8_t* bytes, size_t size);
  void count(const WrittenCommand& command);
  void count_death(const WrittenCommand& command);

  mutable std::mutex lock_;
  std::thread::id reader_;
  std::deque<Step> script_;  // the reader's
  std::vector<WrittenCommand> written_;
  std::map<uint32_t, HandleState> handles_;
  std::vector<std::string> breaches_;
  int threads_ended_ = 0;
  bool miscount_ = false;
  alignas(8) uint8_t area_[65536] = {};
  size_t area_used_ = 0;
};

}  // namespace sentrova::binder
