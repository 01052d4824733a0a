#include "rep_coverage.hpp"

#include <algorithm>
#include <array>

#include "facts/tallies.hpp"
#include "listed_report.hpp"
#include "vorn/volume.h"
#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/rep_coverage";
constexpr std::array kColumns{kName, kPlain, kPlain, kPlain, kPlain, kPlain, kPlain};
constexpr ListedReport kReport{
    .format = report_format::kCoverage,
    .module = kModule,
    .csv_header = "Volume\tShare\tFile Count\tSize(Byte)\tAllocated(Byte)\tUnreadable\tOther",
    .columns = kColumns,
    .fleet_sql =
        "select concat(server, ':', value[8]), concat(server, ':', value[2]), value[3], value[4], "
        "value[5], value[6], value[7] from report_row where {runs} and report = 'coverage' "
        "order by server, profile, position"};

// As other reports call it; the path of one that has no identifier.
std::string id_of(const std::string& volume) {
  std::array<char, 64> id{};
  if (volume.empty() || VornQazVolumeGetId(volume.c_str(), id.data(), id.size()) < 0) {
    REPORT_LOG_ERR(kModule, __LINE__, "get volume id failed, volume=%s\n", volume.c_str());
    return volume;
  }
  return id.data();
}

}  // namespace

// By volume; on each the share with the most first.
int32_t coverage(ReportArgs* args) {
  if (args->fleet != nullptr) {
    return run_fleet_report(kReport, args);
  }
  struct Part {
    const ShareTally* share;
    const VolumeTally* volume;
  };
  std::vector<Part> parts;
  for (const ShareTally& share : tallies().shares()) {
    for (const VolumeTally& volume : share.volumes()) {
      if (!share.is_missing()) {
        parts.push_back({&share, &volume});
      }
    }
  }
  std::stable_sort(parts.begin(), parts.end(), [](const Part& one, const Part& two) {
    return one.volume->volume != two.volume->volume ? one.volume->volume < two.volume->volume
                                                    : one.volume->allocated > two.volume->allocated;
  });
  std::vector<ListedRow> rows;
  for (const auto& [share, volume] : parts) {
    rows.push_back({id_of(volume->volume), share->name(), std::to_string(volume->total.files),
                    std::to_string(volume->total.bytes), std::to_string(volume->allocated),
                    std::to_string(volume->unreadable), std::to_string(volume->other),
                    volume->volume});
  }
  return run_listed_report(kReport, args, rows);
}

}  // namespace vornreport
