#pragma once

#include <stddef.h>
#include <stdint.h>
#include <string.h>

#include <type_traits>

namespace sentrova::binder {

// Commands on their way to the driver, in the order of writing. Fixed room: the user hands them
// over when the next one might not fit.
class CommandWriter {
 public:
  // More than the longest command of the protocol.
  static constexpr size_t kLongestCommand = 128;

  bool has_room() const { return sizeof(bytes_) - size_ >= kLongestCommand; }
  bool empty() const { return size_ == 0; }
  const uint8_t* data() const { return bytes_; }
  size_t size() const { return size_; }
  void clear() { size_ = 0; }

  template <typename... Payload>
  void put(uint32_t command, const Payload&... payload) {
    static_assert(sizeof(command) + (sizeof(payload) + ... + 0) <= kLongestCommand);
    append(command);
    (append(payload), ...);
  }

 private:
  template <typename T>
  void append(const T& value) {
    static_assert(std::is_trivially_copyable_v<T>);
    memcpy(bytes_ + size_, &value, sizeof(value));
    size_ += sizeof(value);
  }

  size_t size_ = 0;
  uint8_t bytes_[4096];
};

// What the driver returned and is not yet dealt with.
class CommandReader {
 public:
  bool empty() const { return position_ == size_; }
  uint8_t* room() { return bytes_; }
  size_t capacity() const { return sizeof(bytes_); }
  // The room holds `size` bytes now, at most its capacity.
  void fill(size_t size) {
    position_ = 0;
    size_ = size;
  }
  void clear() { fill(0); }

  // False, with nothing read, when fewer bytes are left.
  template <typename T>
  bool read(T* out) {
    static_assert(std::is_trivially_copyable_v<T>);
    if (size_ - position_ < sizeof(T))
      return false;
    memcpy(out, bytes_ + position_, sizeof(T));
    position_ += sizeof(T);
    return true;
  }
  bool skip(size_t count) {
    if (size_ - position_ < count)
      return false;
    position_ += count;
    return true;
  }

 private:
  size_t position_ = 0;
  size_t size_ = 0;
  uint8_t bytes_[1024];
};

}  // namespace sentrova::binder
