// The figures of a finished report that its mail and the administrator's tool name.
#ifndef VORN_HOST_REPORT_FIGURES_HPP
#define VORN_HOST_REPORT_FIGURES_HPP

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace host {

// When a volume is full at the speed of its history.
enum class Outlook {
  unknown,    // the profile shows no history, or it has just begun
  no_growth,  // to speak of
  soon,       // in less than a day
  days
};

// Of the volumes the one of which the largest part is used.
struct FullestVolume {
  std::string name;
  double percent = 0;
  Outlook outlook = Outlook::unknown;
  std::uint64_t days = 0;  // with Outlook::days
};

struct LargestShare {
  std::string name;
  std::uint64_t size = 0;  // bytes
};

struct QuotaFigures {
  // Those that use more than 90 % of a quota, with the percentage; the largest first, each once.
  std::vector<std::pair<std::string, double>> users;
  bool is_cut = false;  // a volume has as many users as the report holds, so there may be more
};

struct DuplicateFigures {
  std::uint64_t bytes = 0;  // of all files of each group but one; a file of two shares counts once
  bool is_confirmed = false;  // by content, not by name and size
  bool is_cut = false;        // the page holds the first groups only
};

// Each is absent when its report wasn't selected, has no rows or is damaged.
struct ReportFigures {
  std::optional<FullestVolume> volume;
  std::optional<LargestShare> share;
  std::optional<QuotaFigures> quota;
  std::optional<DuplicateFigures> duplicates;
};

inline constexpr int kMostDuplicateGroups = 200;     // in a page
inline constexpr std::size_t kMostQuotaUsers = 100;  // of a volume, in a page

// Reads the data blocks of the page `path` (a regular file, no link) line by line, at most 64 MiB
// of it: names are whatever users make of them, so nothing is run and no size is trusted. No
// figures when the page can't be read.
ReportFigures read_figures(const char* path);

}  // namespace host

#endif
