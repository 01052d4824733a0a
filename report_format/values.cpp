#include "report_format/values.hpp"

#include <algorithm>

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

bool is_language_code(std::string_view code) {
  return !code.empty() && code.size() <= kLongestLanguage && code.front() != '-' &&
         std::all_of(code.begin(), code.end(), [](char c) {
           return (lower(c) >= 'a' && lower(c) <= 'z') || (c >= '0' && c <= '9') || c == '-';
         });
}

}  // namespace report_format
