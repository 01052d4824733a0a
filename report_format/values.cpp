#include "report_format/values.hpp"

#include <algorithm>
#include <charconv>
#include <system_error>

namespace report_format {
namespace {

constexpr char lower(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

// `word` is in lower case.
bool is_word(std::string_view value, std::string_view word) {
  return std::equal(value.begin(), value.end(), word.begin(), word.end(),
                    [](char a, char b) { return lower(a) == b; });
}

}  // namespace

bool is_true(std::string_view value) {
  return is_word(value, "true");
}

bool is_false(std::string_view value) {
  return is_word(value, "false");
}

std::optional<int> whole_number(std::string_view digits) {
  int value = 0;
  const auto [end, error] = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  const bool is_plain = !digits.empty() && digits.front() >= '0' && digits.front() <= '9';
  return is_plain && error == std::errc() && end == digits.data() + digits.size()
             ? std::optional(value)
             : std::nullopt;
}

bool is_language_code(std::string_view code) {
  return !code.empty() && code.size() <= kLongestLanguage && code.front() != '-' &&
         std::all_of(code.begin(), code.end(), [](char c) {
           return (lower(c) >= 'a' && lower(c) <= 'z') || (c >= '0' && c <= '9') || c == '-';
         });
}

}  // namespace report_format
