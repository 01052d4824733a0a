#include "facts/assemble.hpp"

#include <algorithm>
#include <array>
#include <tuple>

#include "facts/attention.hpp"
#include "facts/forecast.hpp"
#include "facts/growth_facts.hpp"
#include "report_format/reports.hpp"
#include "vorn/volume.h"

namespace vornreport {
namespace {

using report_format::Facts;
using report_format::facts_text;
using report_format::ForecastState;

// The history keeps no more of a mount path.
constexpr size_t kStoredName = 31;

bool is_asked_for(const report_format::ReportFormat& report, const FactsSource& source) {
  return report_format::is_selected(report.name, source.report_list);
}

// --- Volumes ------------------------------------------------------------------------------------

std::string id_of(const std::string& stored_name) {
  std::array<char, 64> id{};
  return VornQazVolumeGetId(stored_name.c_str(), id.data(), id.size()) < 0 ? "" : id.data();
}

// The samples of a volume, this run's own included. Of volumes whose stored names are equal nobody
// can tell whose they are.
std::vector<report_format::Sample> samples_of(const MeasuredVolume& volume, const RunFacts& run,
                                              const FactsSource& source) {
  const std::string name = volume.path.substr(0, kStoredName);
  std::vector<report_format::Sample> samples;
  const auto namesakes = std::count_if(
      run.volumes.begin(), run.volumes.end(),
      [&](const MeasuredVolume& other) { return other.path.substr(0, kStoredName) == name; });
  if (const auto stored = source.samples.find(name);
      namesakes == 1 && stored != source.samples.end()) {
    samples = stored->second;
  }
  samples.push_back({volume.time, volume.size - volume.free});
  return daily_samples(std::move(samples), source.now);
}

report_format::VolumeFacts volume_facts(const MeasuredVolume& volume, const RunFacts& run,
                                        const FactsSource& source) {
  report_format::VolumeFacts facts;
  facts.id = id_of(volume.path.substr(0, kStoredName));
  facts.path = facts_text(volume.path);
  facts.size = volume.size;
  facts.free = volume.free;
  facts.used = volume.size - volume.free;
  facts.percent = volume.size == 0
                      ? 0
                      : static_cast<double>(facts.used) * 100.0 / static_cast<double>(volume.size);
  facts.samples = samples_of(volume, run, source);
  facts.forecast = forecast(facts.samples, volume.size, volume.free);
  facts.level = volume_level(facts.percent, facts.forecast);
  return facts;
}

// The greater the more pressing: level, nothing free, days, use.
auto pressure(const report_format::VolumeFacts& volume) {
  constexpr int64_t kNever = INT64_MAX;
  const bool is_full = volume.size != 0 && volume.forecast.state == ForecastState::kFull;
  return std::tuple(volume.level, is_full, -volume.forecast.days.value_or(kNever), volume.percent);
}

// What the shares account for, and what they don't; less than nothing where files share blocks.
void explain(report_format::VolumeFacts& facts, const std::string& path, const Tallies& tallies) {
  uint64_t explained = 0;
  for (const ShareTally& share : tallies.shares()) {
    for (const VolumeTally& volume : share.volumes()) {
      add_bounded(explained, volume.volume == path ? volume.explained : 0);
    }
  }
  constexpr uint64_t kMost = INT64_MAX;
  facts.explained = static_cast<int64_t>(std::min(explained, kMost));
  facts.outside = static_cast<int64_t>(std::min(facts.used, kMost)) - *facts.explained;
}

std::vector<report_format::VolumeFacts> volumes_of(const RunFacts& run, const Tallies& tallies,
                                                   const FactsSource& source) {
  std::vector<report_format::VolumeFacts> volumes;
  for (const MeasuredVolume& volume : run.volumes) {
    volumes.push_back(volume_facts(volume, run, source));
    if (is_asked_for(report_format::kCoverage, source)) {
      explain(volumes.back(), volume.path, tallies);
    }
  }
  put_pressing_first(volumes);
  return volumes;
}

// What the volumes hold and what has grown on them. They are in another order than in the run.
void add_causes(std::vector<report_format::VolumeFacts>& volumes, const RunFacts& run,
                const Tallies& tallies, const FactsSource& source) {
  const auto* names =
      run.owners && is_asked_for(report_format::kFileOwner, source) ? &*run.owners : nullptr;
  for (const MeasuredVolume& volume : run.volumes) {
    const auto place = std::find_if(volumes.begin(), volumes.end(), [&](const auto& facts) {
      return facts.path == facts_text(volume.path);
    });
    place->filled_by = filled_by(tallies, names, volume.path);
    if (run.growth) {
      if (auto grown = growth_on(*run.growth, volume.path)) {
        place->grown_by = std::move(grown->causes);
      }
    }
  }
}

// --- Lists of the gathering ---------------------------------------------------------------------

template <typename List>
void sort_by_size(List& list) {
  std::stable_sort(list.begin(), list.end(),
                   [](const auto& one, const auto& two) { return one.bytes > two.bytes; });
}

template <typename Record>
void add(Record& record, const Amount& amount) {
  Amount sum{record.files, record.bytes};
  sum.add(amount);
  record.files = sum.files;
  record.bytes = sum.bytes;
}

std::vector<report_format::ShareFacts> shares_of(const Tallies& tallies) {
  std::vector<report_format::ShareFacts> shares;
  for (const ShareTally& tally : tallies.shares()) {
    report_format::ShareFacts& share = shares.emplace_back();
    share.name = tally.name();
    share.path = facts_text(tally.path());
    share.volume = facts_text(tally.volume());
    add(share, tally.total());
    share.folders = tally.folders();
    share.allocated = tally.allocated();
    share.unreadable = tally.unreadables();
    share.other = tally.others();
    share.whole = tally.is_whole();
    share.index = tally.is_of_index();
  }
  sort_by_size(shares);
  return shares;
}

// In an order that doesn't change from run to run.
std::vector<std::tuple<std::string, uid_t, Amount>> owners_in(const ShareTally& share) {
  std::vector<std::tuple<std::string, uid_t, Amount>> owners;
  for (const VolumeTally& volume : share.volumes()) {
    for (const auto& [uid, amount] : volume.owners) {
      owners.emplace_back(volume.volume, uid, amount);
    }
  }
  std::sort(owners.begin(), owners.end(), [](const auto& one, const auto& two) {
    return std::tie(std::get<1>(one), std::get<0>(one)) <
           std::tie(std::get<1>(two), std::get<0>(two));
  });
  return owners;
}

std::vector<report_format::OwnerFacts> owners_of(const Tallies& tallies,
                                                 const std::map<unsigned, std::string>& names) {
  std::map<std::string, report_format::OwnerFacts> owners;
  for (const ShareTally& tally : tallies.shares()) {
    for (const auto& [volume, uid, amount] : owners_in(tally)) {
      const auto name = names.find(uid);
      if (name == names.end()) {
        continue;
      }
      report_format::OwnerFacts& owner = owners[name->second];
      owner.name = name->second;
      add(owner, amount);
      owner.places.push_back({tally.name(), facts_text(volume), amount.files, amount.bytes});
    }
  }
  std::vector<report_format::OwnerFacts> list;
  for (auto& [name, owner] : owners) {
    sort_by_size(owner.places);
    list.push_back(std::move(owner));
  }
  sort_by_size(list);
  return list;
}

std::vector<report_format::TypeFacts> types_of(const Tallies& tallies) {
  std::map<std::string, report_format::TypeFacts> types;
  for (const ShareTally& tally : tallies.shares()) {
    std::map<std::string, Amount> in_share;
    for (const VolumeTally& volume : tally.volumes()) {
      for (const auto& [label, amount] : volume.types) {
        in_share[label].add(amount);
      }
    }
    for (const auto& [label, amount] : in_share) {
      report_format::TypeFacts& type = types[label];
      type.type = label;
      add(type, amount);
      type.shares.push_back({tally.name(), amount.files, amount.bytes});
    }
  }
  std::vector<report_format::TypeFacts> list;
  for (auto& [label, type] : types) {
    sort_by_size(type.shares);
    list.push_back(std::move(type));
  }
  sort_by_size(list);
  return list;
}

std::vector<report_format::AgeFacts> ages_of(const Tallies& tallies) {
  std::vector<report_format::AgeFacts> ages;
  for (size_t age = 0; age < report_format::kAges.size(); ++age) {
    Amount sum;
    for (const ShareTally& share : tallies.shares()) {
      sum.add(share.ages()[age]);
    }
    ages.push_back({report_format::kAges[age].name, sum.files, sum.bytes});
  }
  return ages;
}

}  // namespace

void put_pressing_first(std::vector<report_format::VolumeFacts>& volumes) {
  std::stable_sort(volumes.begin(), volumes.end(),
                   [](const auto& one, const auto& two) { return pressure(one) > pressure(two); });
}

std::vector<report_format::ReportFacts> reports_of(const RunFacts& run, const FactsSource& source) {
  std::vector<report_format::ReportFacts> reports;
  for (const report_format::ReportFormat* format : report_format::kReports) {
    if (!is_asked_for(*format, source)) {
      continue;
    }
    report_format::ReportFacts& report = reports.emplace_back();
    report.name = format->name;
    if (const auto counts = run.rows.find(format->name); counts != run.rows.end()) {
      report.rows = counts->second.rows;
      report.shown = counts->second.shown;
    }
    if (format->page_limit != 0) {
      report.limit = format->page_limit;
    }
    if (format->has_csv_rows) {
      report.csv = std::string("csv/") + format->name + ".csv";
    }
    report.ok = !run.failed.contains(format->name);
  }
  return reports;
}

Facts assemble_facts(const RunFacts& run, const Tallies& tallies, const FactsSource& source) {
  Facts facts;
  facts.host = source.host;
  facts.profile = run.profile;
  facts.time_zone = source.time_zone;
  facts.language = run.language;
  facts.started = run.started;
  facts.finished = source.now;
  facts.incidents = run.incidents;
  facts.complete = std::none_of(
      run.incidents.begin(), run.incidents.end(),
      [](const auto& incident) { return incident.level == report_format::IncidentLevel::kError; });
  facts.volumes = volumes_of(run, tallies, source);
  if (source.has_walked) {
    facts.shares = shares_of(tallies);
  }
  if (run.owners && is_asked_for(report_format::kFileOwner, source)) {
    facts.owners = owners_of(tallies, *run.owners);
  }
  if (is_asked_for(report_format::kFileGroup, source)) {
    facts.types = types_of(tallies);
  }
  if (is_asked_for(report_format::kFileAge, source)) {
    facts.ages = ages_of(tallies);
  }
  if (run.quotas) {
    facts.quotas = run.quotas->users();
  }
  if (source.has_walked) {
    add_causes(facts.volumes, run, tallies, source);
  }
  if (run.growth) {
    add_grown(facts, *run.growth);
  }
  add_samples(facts, source.snapshots, run);
  facts.duplicates = run.duplicates;
  facts.reports = reports_of(run, source);
  facts.attention = attention_of(facts, run, tallies);
  return facts;
}

}  // namespace vornreport
