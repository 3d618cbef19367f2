#pragma once

#include <string>

namespace sentrova {

// Stands in the photograph's file as plain text, so that it can be looked for on a raw partition.
inline constexpr char kPhotographComment[] = "An afternoon at the lake";

// A PNG image (ISO/IEC 15948) of about 300 KiB, the same bytes every time.
std::string make_photograph();

// The SHA-256 digest of these bytes, in hexadecimal digits; empty on failure.
std::string sha256_text(const std::string& bytes);

}  // namespace sentrova
