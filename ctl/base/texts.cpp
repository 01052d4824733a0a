#include "base/texts.hpp"

#include <array>
#include <cstdio>
#include <iomanip>
#include <sstream>

namespace ctl {
namespace {

std::string local_text(const char* format, std::time_t time) {
  std::tm local{};
  localtime_r(&time, &local);
  std::ostringstream text;
  text << std::put_time(&local, format);
  return text.str();
}

}  // namespace

const char* word_for(admin::RunState state) {
  switch (state) {
    case admin::RunState::never_ran:
      return "never ran";
    case admin::RunState::running:
      return "running";
    case admin::RunState::succeeded:
      return "success";
    case admin::RunState::failed:
      return "fail";
    case admin::RunState::ended_early:
      return "ended early";
    case admin::RunState::unknown:
      break;
  }
  return "unknown";
}

std::string size_text(std::uint64_t bytes) {
  constexpr std::array kUnits{"B", "KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
  constexpr double kStep = 1024;
  auto value = static_cast<double>(bytes);
  std::size_t unit = 0;
  // What would be rounded to 1024 is 1 of the next unit.
  for (; value >= kStep - 0.05 && unit + 1 < kUnits.size(); ++unit) {
    value /= kStep;
  }
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%.*f %s", unit == 0 ? 0 : 1, value, kUnits[unit]);
  return text.data();
}

std::string time_text(std::time_t time) {
  return local_text("%Y-%m-%d %H:%M", time);
}

std::string json_time(std::time_t time) {
  return local_text("%Y-%m-%dT%H:%M:%S%z", time);
}

}  // namespace ctl
