// The figures of a finished report that its status shows.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace admin {

// When a volume is full at the speed of its history.
enum class Outlook {
  unknown,    // the profile shows no history, or it has just begun
  no_growth,  // to speak of
  soon,       // in less than a day
  days
};

// Of the volumes of a report the one of which the largest part is used.
struct FullestVolume {
  std::string name;
  double percent = 0;
  Outlook outlook = Outlook::unknown;
  std::uint64_t days = 0;  // with Outlook::days
};
// Nothing when the report at `page` has no volumes or is damaged.
std::optional<FullestVolume> fullest_volume(const std::string& page);

}  // namespace admin
