#include <array>
#include <cstdio>
#include <ctime>
#include <initializer_list>
#include <string>
#include <utility>

#include "actions.hpp"
#include "db_snapshots.hpp"
#include "db_volume_usage.hpp"
#include "facts/assemble.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "module.hpp"
#include "report_format/reports.hpp"
#include "vorn/report.h"
#include "vorn/volume.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/registry.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr int64_t kDay = 86400;

using Text = std::array<char, 256>;

std::string server_text(int (*get)(char* out, size_t size)) {
  Text text{};
  return get(text.data(), text.size()) < 0 ? "" : text.data();
}

bool gathers(const char* report_list) {
  for (const ReportEntry& entry : report_registry()) {
    if (entry.source == ReportSource::kStatistics && is_selected(entry, report_list)) {
      return true;
    }
  }
  return false;
}

// The report has measured the volumes for itself; without it they are as old as the run.
void measure_when_old(const char* report_list) {
  if (!report_format::is_selected(report_format::kVolumeUsage.name, report_list)) {
    const VolumesHandle volumes(VORNMountVolAllEnum(nullptr, VORN_VOLUMES_OF_USAGE));
    note_volumes(volumes.get());
  }
}

FactsSource source_of(const char* report_list) {
  FactsSource source;
  source.host = server_text(VornQazGetHostName);
  source.time_zone = server_text(VornQazGetTimeZone);
  source.now = std::time(nullptr);
  source.report_list = report_list;
  source.has_walked = gathers(report_list);
  const std::optional<QuotaTally>& quotas = run_facts().quotas;
  if (auto samples = VolumeUsageSamples(source.now - kSampleDays * kDay)) {
    source.samples = std::move(*samples);
    if (auto seen = SnapshotSamplesOf(
            run_facts().profile, source.now,
            quotas ? quotas->users() : std::vector<report_format::QuotaFacts>())) {
      source.snapshots = std::move(*seen);
    }
  } else {
    record_incident(
        "history_lost", "history",
        "the history of volumes can't be read, so nothing is known of their growth; the "
        "log says why",
        AlreadyLogged::kYes);
  }
  return source;
}

// Writes the texts to the end of `path`. False, logged, when they aren't there then.
bool write_texts(const char* path, const char* mode, std::initializer_list<const char*> texts) {
  FileHandle file = open_report_file(path, mode, kDriverModule, __LINE__);
  if (!file) {
    return false;
  }
  for (const char* text : texts) {
    std::fputs(text, file.get());
  }
  return close_report_file(std::move(file), path, kDriverModule, __LINE__);
}

}  // namespace

bool write_facts(const report_format::Facts& facts, const char* date_dir, const char* data_path) {
  const std::string line = report_format::to_line(facts);
  PathText path;
  path.format("%s/%s", date_dir, report_format::kFactsFile);
  return write_texts(data_path, "a",
                     {"<script type='text/javascript'>\nvar ", report_format::kFactsVariable, " = ",
                      line.c_str(), ";\n</script>\n"}) &&
         write_texts(path.c_str(), "w", {line.c_str(), "\n"});
}

bool close_facts(const VLIBCSzHash* profile_hash, const char* data_path) {
  const char* date_dir = set_value(profile_hash, "real_path_date");
  const char* report_list = set_value(profile_hash, "report_list");
  if (date_dir == nullptr || report_list == nullptr || is_unset(data_path)) {
    return true;  // nothing becomes of this run, as assembly is about to say
  }
  measure_when_old(report_list);
  // The history comes first: that it can't be read is a fact as well.
  const FactsSource source = source_of(report_list);
  return write_facts(assemble_facts(run_facts(), tallies(), source), date_dir, data_path);
}

}  // namespace vornreport
