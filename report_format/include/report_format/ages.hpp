// How old files are: the classes of the report on ages, by days since the last change.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace report_format {

struct Age {
  const char* name;
  std::int64_t from;  // days, included
};

// The youngest first. A change dated up to a day ahead counts to the first; what is further ahead
// to the last, which no number of days leads to.
inline constexpr std::array kAges{Age{"0-7", 0},      Age{"7-30", 7},       Age{"30-90", 30},
                                  Age{"90-365", 90},  Age{"365-1095", 365}, Age{"1095-1825", 1095},
                                  Age{"1825-", 1825}, Age{"future", -1}};

// Index in kAges of a file that was changed at `changed`, seen from `now`, both in seconds.
constexpr std::size_t age_of(std::int64_t changed, std::int64_t now) {
  constexpr std::int64_t kDay = 86400;
  const std::int64_t seconds = now - changed;
  if (seconds < -kDay) {
    return kAges.size() - 1;
  }
  std::size_t age = 0;
  while (age + 2 < kAges.size() && seconds >= kAges[age + 1].from * kDay) {
    ++age;
  }
  return age;
}

}  // namespace report_format
