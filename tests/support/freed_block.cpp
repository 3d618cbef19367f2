#include "tests/support/freed_block.h"

#include <stdint.h>

#include <algorithm>

#if defined(__has_feature)
#if __has_feature(address_sanitizer)
#define UNDER_ADDRESS_SANITIZER 1
#endif
#elif defined(__SANITIZE_ADDRESS__)
#define UNDER_ADDRESS_SANITIZER 1
#endif

namespace sentrova {
namespace {

thread_local const void* watched_block = nullptr;
thread_local FreedBlock::State watched_state = FreedBlock::kNotFreed;

void note_freed(const volatile void* block) {
  if (block == nullptr || block != watched_block)
    return;
  // Only the middle: the heap keeps its own notes at the ends of free blocks.
  const auto* const bytes = static_cast<const volatile uint8_t*>(block) + 64;
  const bool wiped = std::all_of(bytes, bytes + 128, [](uint8_t byte) { return byte == 0; });
  watched_state = wiped ? FreedBlock::kWiped : FreedBlock::kNotWiped;
  watched_block = nullptr;
}

}  // namespace

FreedBlock::FreedBlock(const void* block) {
  watched_block = block;
  watched_state = kNotFreed;
}

FreedBlock::~FreedBlock() {
  watched_block = nullptr;
}

FreedBlock::State FreedBlock::state() const {
  return watched_state;
}

}  // namespace sentrova

#ifdef UNDER_ADDRESS_SANITIZER

#include <sanitizer/allocator_interface.h>

namespace {
// The sanitizer installs both hooks or none.
[[maybe_unused]] const int hooks_installed = __sanitizer_install_malloc_and_free_hooks(
    [](const volatile void*, size_t) {},
    [](const volatile void* block) { sentrova::note_freed(block); });
}  // namespace

#else

// The C library's own allocator under the names that it gives to those who replace its front.
extern "C" {
void __libc_free(void* block);

void free(void* block) {
  sentrova::note_freed(block);
  __libc_free(block);
}
}

#endif
