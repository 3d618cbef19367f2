#pragma once

namespace sentrova::testing {

// Limits that a process cannot take back; for the child of a death test.

// Makes every further fork fail with EAGAIN, for which root becomes another user. Returns whether
// it does.
bool forbid_new_processes();

// Makes every further descriptor but one fail with EMFILE, so that a pipe is refused and a folder
// can still be read. Returns whether it does.
bool forbid_new_descriptors();

}  // namespace sentrova::testing
