#pragma once

#include <string>

namespace sentrova::fs_mgr {

// The suffix of the slot that the device did not boot from; empty on a device without the two slots
// "_a" and "_b".
std::string other_slot_suffix();

}  // namespace sentrova::fs_mgr
