// UTF-8, for texts that may be any bytes.
#ifndef VORN_HOST_UTF8_HPP
#define VORN_HOST_UTF8_HPP

#include <cstddef>
#include <string_view>

namespace host {

struct Utf8Char {
  char32_t code = 0;
  std::size_t length = 0;  // in bytes; 0 when there is no valid character
};

// The character at the start of `text`. Overlong forms, surrogates and what lies above U+10FFFF
// are not valid.
inline Utf8Char utf8_at(std::string_view text) {
  const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  if (text.empty()) {
    return {};
  }
  if (byte(0) < 0x80) {
    return {byte(0), 1};
  }
  std::size_t length = 0;
  char32_t code = 0;
  char32_t smallest = 0;
  if ((byte(0) & 0xE0U) == 0xC0) {
    length = 2, code = byte(0) & 0x1FU, smallest = 0x80;
  } else if ((byte(0) & 0xF0U) == 0xE0) {
    length = 3, code = byte(0) & 0x0FU, smallest = 0x800;
  } else if ((byte(0) & 0xF8U) == 0xF0) {
    length = 4, code = byte(0) & 0x07U, smallest = 0x10000;
  }
  if (length == 0 || text.size() < length) {
    return {};
  }
  for (std::size_t i = 1; i < length; ++i) {
    if ((byte(i) & 0xC0U) != 0x80) {
      return {};
    }
    code = code << 6 | (byte(i) & 0x3FU);
  }
  const bool surrogate = code >= 0xD800 && code <= 0xDFFF;
  if (code < smallest || code > 0x10FFFF || surrogate) {
    return {};
  }
  return {code, length};
}

// Control characters of ASCII and of ISO 8859-1's upper half.
constexpr bool is_control(char32_t code) {
  return code < 0x20 || (code >= 0x7F && code < 0xA0);
}

}  // namespace host

#endif
