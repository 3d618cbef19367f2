#pragma once

namespace sentrova {

// Looks at a block of the heap at the moment when the calling thread gives it back. For tests.
class FreedBlock {
 public:
  enum State { kNotFreed, kWiped, kNotWiped };

  explicit FreedBlock(const void* block);
  ~FreedBlock();
  State state() const;
};

}  // namespace sentrova
