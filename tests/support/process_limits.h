#pragma once

namespace sentrova::testing {

// Makes every further fork of this process fail with EAGAIN, for good, for which root becomes
// another user: for the child of a death test. Returns whether it does.
bool forbid_new_processes();

}  // namespace sentrova::testing
