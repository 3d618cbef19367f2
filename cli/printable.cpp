#include "cli/printable.h"

#include <android-base/stringprintf.h>

#include <algorithm>
#include <string_view>

namespace sentrova {
namespace {

constexpr char kEllipsis[] = "...";

struct Character {
  char32_t code = 0;
  size_t bytes = 0;  // 0: what stands there is not UTF-8
};

struct CodeRange {
  char32_t first;
  char32_t last;
};

// Controls, line and paragraph ends, marks of the direction of writing, surrogates, and what no
// character stands for.
constexpr CodeRange kInvisible[] = {
    {0x00, 0x1F},     {0x7F, 0x9F},     {0xAD, 0xAD},     {0x61C, 0x61C},   {0x200B, 0x200F},
    {0x2028, 0x202E}, {0x2060, 0x206F}, {0xD800, 0xDFFF}, {0xFEFF, 0xFEFF}, {0xE0000, 0x1FFFFF},
};

// Two columns each: East Asian scripts, full-width forms and emoji (Unicode Standard Annex 11).
constexpr CodeRange kWide[] = {
    {0x1100, 0x115F}, {0x2E80, 0xA4CF}, {0xA960, 0xA97C},   {0xAC00, 0xD7A3},   {0xF900, 0xFAFF},
    {0xFE30, 0xFE6F}, {0xFF00, 0xFF60}, {0x1F300, 0x1FAFF}, {0x20000, 0x3FFFD},
};

// No column of their own: combining marks.
constexpr CodeRange kCombining[] = {
    {0x300, 0x36F}, {0x1AB0, 0x1AFF}, {0x20D0, 0x20FF}, {0xFE00, 0xFE0F}, {0xFE20, 0xFE2F}};

template <size_t kCount>
bool is_in(char32_t code, const CodeRange (&ranges)[kCount]) {
  return std::any_of(ranges, ranges + kCount, [code](const CodeRange& range) {
    return range.first <= code && code <= range.last;
  });
}

// The text is not empty.
Character first_character(std::string_view text) {
  constexpr char32_t kLeastOfLength[] = {0, 0, 0x80, 0x800, 0x10000};
  const auto lead = static_cast<unsigned char>(text[0]);
  if (lead < 0x80) {
    return {lead, 1};
  }
  const size_t bytes = lead >= 0xF8   ? 0
                       : lead >= 0xF0 ? 4
                       : lead >= 0xE0 ? 3
                       : lead >= 0xC0 ? 2
                                      : 0;
  if (bytes == 0 || bytes > text.size()) {
    return {};
  }
  char32_t code = lead & (0x7Fu >> bytes);
  for (size_t i = 1; i < bytes; ++i) {
    const auto next = static_cast<unsigned char>(text[i]);
    if ((next & 0xC0) != 0x80) {
      return {};
    }
    code = code << 6 | (next & 0x3Fu);
  }
  return code < kLeastOfLength[bytes] ? Character() : Character{code, bytes};
}

size_t columns(char32_t code) {
  return is_in(code, kCombining) ? 0 : is_in(code, kWide) ? 2 : 1;
}

}  // namespace

std::string printable(const std::string& text) {
  std::string result;
  for (std::string_view rest = text; !rest.empty();) {
    const Character character = first_character(rest);
    const size_t bytes = std::max<size_t>(character.bytes, 1);
    if (character.bytes > 0 && !is_in(character.code, kInvisible)) {
      result += rest.substr(0, bytes);
    } else {
      for (const char byte : rest.substr(0, bytes)) {
        android::base::StringAppendF(&result, "\\x%02x", static_cast<unsigned char>(byte));
      }
    }
    rest.remove_prefix(bytes);
  }
  return result;
}

size_t display_width(const std::string& text) {
  size_t width = 0;
  for (std::string_view rest = text; !rest.empty();) {
    const Character character = first_character(rest);
    width += columns(character.code);
    rest.remove_prefix(std::max<size_t>(character.bytes, 1));
  }
  return width;
}

std::string shortened(const std::string& text, size_t width) {
  size_t text_width = display_width(text);
  if (text_width <= width) {
    return text;
  }
  const std::string mark = std::string(kEllipsis).substr(0, width);
  std::string_view rest = text;
  while (text_width > width - mark.size()) {
    const Character character = first_character(rest);
    text_width -= columns(character.code);
    rest.remove_prefix(std::max<size_t>(character.bytes, 1));
  }
  return mark + std::string(rest);
}

}  // namespace sentrova
