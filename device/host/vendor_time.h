#pragma once

#include <chrono>

namespace sentrova::device {

// The time that this thread has spent inside the vendor's libraries so far. Their functions are
// called through this program, which hands the calls on (vendor_time.cpp).
std::chrono::microseconds vendor_time();

}  // namespace sentrova::device
