#pragma once

#include <stddef.h>
#include <stdint.h>

namespace sentrova {

// Counts the blocks that the calling thread takes from the heap while this object lives. For tests.
class AllocationCount {
 public:
  AllocationCount();
  size_t since_start() const;

 private:
  const size_t start_;
};

// Looks at a block of the heap at the moment when the calling thread gives it back. For tests.
class FreedBlock {
 public:
  enum State { kNotFreed, kWiped, kNotWiped };

  explicit FreedBlock(const void* block);
  ~FreedBlock();
  State state() const;
};

}  // namespace sentrova
