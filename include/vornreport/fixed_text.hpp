// Text of a fixed capacity, cut when it is longer. Used only where the cut can be seen from
// outside: 4096-byte paths and commands; everything else is std::string.
#pragma once

#include <array>
#include <cstdarg>
#include <cstddef>
#include <cstdio>

namespace vornreport {

// `Size` bytes with the terminator.
template <size_t Size>
class FixedText {
 public:
  // Formats over the old text. False when it was cut.
  [[gnu::format(printf, 2, 3)]] bool format(const char* pattern, ...) {
    va_list args;
    va_start(args, pattern);
    const int length = std::vsnprintf(bytes_.data(), Size, pattern, args);
    va_end(args);
    return length >= 0 && static_cast<size_t>(length) < Size;
  }
  const char* c_str() const { return bytes_.data(); }
  char* data() { return bytes_.data(); }
  bool empty() const { return bytes_[0] == '\0'; }
  void clear() { bytes_[0] = '\0'; }
  static constexpr size_t size() { return Size; }

 private:
  std::array<char, Size> bytes_{};
};

using PathText = FixedText<4096>;
using CommandText = FixedText<4096>;

}  // namespace vornreport
