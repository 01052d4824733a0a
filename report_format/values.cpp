#include "report_format/values.hpp"

#include <algorithm>
#include <charconv>
#include <system_error>

namespace report_format {
namespace {

constexpr char lower(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

}  // namespace

bool is_true(std::string_view value) {
  constexpr std::string_view kTrue = "true";
  return std::equal(value.begin(), value.end(), kTrue.begin(), kTrue.end(),
                    [](char a, char b) { return lower(a) == b; });
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
