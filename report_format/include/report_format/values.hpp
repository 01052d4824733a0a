// Values of the configuration, judged once for all who read them.
#pragma once

#include <cstddef>
#include <optional>
#include <string_view>

namespace report_format {

// "true" in any mix of case; nothing else is.
bool is_true(std::string_view value);
// "false" likewise, for keys that are true without a value.
bool is_false(std::string_view value);

// The number that `digits` are: decimal digits and nothing else. Nothing for another text, and for
// a number that is too large.
std::optional<int> whole_number(std::string_view digits);

// Longest language code; the program hands it on in a buffer of 8 bytes.
inline constexpr std::size_t kLongestLanguage = 7;
// Whether `code` is 1 to 7 letters, digits and '-', not beginning with one: fit for a word of a
// shell command and for the name of a file.
bool is_language_code(std::string_view code);

// From how many per cent of a quota on a user is near to it, and above how many over it.
inline constexpr double kNearQuota = 90;
inline constexpr double kOverQuota = 100;

// How much history a forecast needs: days between its first and last sample, days with samples.
inline constexpr int kShortestWindow = 7;
inline constexpr int kFewestSamples = 4;

}  // namespace report_format
