#include "facts/growth_facts.hpp"

#include <algorithm>
#include <string_view>
#include <tuple>
#include <utility>

#include "facts/forecast.hpp"
#include "report_format/reports.hpp"

namespace vornreport {
namespace {

using report_format::Cause;
using report_format::facts_text;

// --- The snapshot -------------------------------------------------------------------------------

SnapshotPart part_of(const VolumeTally& tally, const RunFacts& run, bool has_owners,
                     bool has_types) {
  SnapshotPart part{tally.volume, tally.total, {}, {}};
  for (const auto& [uid, amount] : tally.owners) {
    if (!has_owners) {
      break;
    }
    if (const auto name = run.owners->find(uid); name != run.owners->end()) {
      part.owners[name->second].add(amount);
    }
  }
  if (has_types) {
    part.types = tally.types;
  }
  return part;
}

// An account that couldn't be looked up would seem to have lost all its files.
bool knows_owners(const RunFacts& run) {
  return run.owners &&
         std::none_of(run.incidents.begin(), run.incidents.end(),
                      [](const auto& incident) { return incident.kind == "users_unknown"; });
}

std::string names_of(const std::optional<std::set<std::string>>& limit) {
  std::string names;
  for (const std::string& name : limit.value_or(std::set<std::string>())) {
    names += name + ",";
  }
  return limit && names.empty() ? "," : names;  // nobody isn't everyone
}

// --- Causes -------------------------------------------------------------------------------------

// The greatest, those of nothing or less left out.
void keep_greatest(std::vector<Cause>& causes, size_t most) {
  std::erase_if(causes, [](const Cause& cause) { return cause.bytes <= 0; });
  std::stable_sort(causes.begin(), causes.end(),
                   [](const Cause& one, const Cause& two) { return one.bytes > two.bytes; });
  causes.resize(std::min(causes.size(), most));
}

bool is_below(const Cause& folder, const Cause& other) {
  return folder.share == other.share && folder.name.size() > other.name.size() &&
         folder.name.starts_with(other.name) && folder.name[other.name.size()] == '/';
}

// Leaves out folders that grew because of one below them, which says where.
void keep_nearest(std::vector<Cause>& folders) {
  keep_greatest(folders, kMostFoldersOfVolume);  // few share the growth that is worth telling
  const std::vector<Cause> all = folders;
  std::erase_if(folders, [&](const Cause& folder) {
    const int64_t most_of_it = folder.bytes - folder.bytes / 10;
    return std::any_of(all.begin(), all.end(), [&](const Cause& other) {
      return other.bytes >= most_of_it && is_below(other, folder);
    });
  });
}

int64_t as_signed(uint64_t bytes) {
  return static_cast<int64_t>(std::min<uint64_t>(bytes, INT64_MAX));
}

// Sums by name.
using Sums = std::map<std::string, int64_t>;

void add_owners(std::vector<Cause>& causes, const Sums& owners) {
  for (const auto& [name, bytes] : owners) {
    causes.push_back({"owner", "", name, bytes, {}});
  }
}

// Shares that have something on another volume.
std::set<std::string> shares_elsewhere(const GrowthSince& since, const std::string& volume) {
  std::set<std::string> shares;
  for (const Change& change : since.changes) {
    if (change.kind == GrowthKind::kShare && change.volume != volume) {
      shares.insert(change.share);
    }
  }
  return shares;
}

// --- What has grown -----------------------------------------------------------------------------

std::optional<report_format::GrownSince>& place_of(report_format::Grown& grown,
                                                   std::string_view since) {
  return since == "last" ? grown.last : since == "week" ? grown.week : grown.month;
}

// Changes of one kind, summed up over shares or volumes by the field that names them.
std::map<std::string, report_format::GrownSince> sums_of(const GrowthSince& since, GrowthKind kind,
                                                         std::string Change::*name) {
  std::map<std::string, report_format::GrownSince> sums;
  for (const Change& change : since.changes) {
    if (change.kind == kind) {
      report_format::GrownSince& sum = sums[change.*name];
      sum.since = since.time;
      sum.files = bounded_sum(sum.files, change.files);
      sum.bytes = bounded_sum(sum.bytes, change.bytes);
    }
  }
  return sums;
}

template <typename Record>
void add_grown_to(std::vector<Record>& records, std::string Record::*record_name,
                  const Growth& growth, GrowthKind kind, std::string Change::*name) {
  for (Record& record : records) {
    record.grown.emplace();
  }
  for (const GrowthSince& since : growth) {
    const auto sums = sums_of(since, kind, name);
    for (Record& record : records) {
      if (const auto sum = sums.find(record.*record_name); sum != sums.end()) {
        place_of(*record.grown, since.since) = sum->second;
      }
    }
  }
}

template <typename Key>
std::vector<report_format::Sample> with_now(
    const std::map<Key, std::vector<report_format::Sample>>& stored, const Key& key,
    report_format::Sample now) {
  std::vector<report_format::Sample> samples;
  if (const auto found = stored.find(key); found != stored.end()) {
    samples = found->second;
  }
  samples.push_back(now);
  return daily_samples(std::move(samples), now.time);
}

}  // namespace

Snapshot take_snapshot(const RunFacts& run, const Tallies& tallies,
                       const std::string& report_list) {
  Snapshot set;
  set.time = run.started;
  set.has_types = report_format::is_selected(report_format::kFileGroup.name, report_list);
  if (knows_owners(run)) {
    set.owners_among = names_of(run.limit_user);
  }
  for (const ShareTally& tally : tallies.shares()) {
    SnapshotShare& share = set.shares.emplace_back();
    share.name = tally.name();
    share.is_whole = tally.is_whole();
    share.has_all_folders = tallies.has_all_folders(set.shares.size() - 1);
    for (const VolumeTally& volume : tally.volumes()) {
      share.parts.push_back(part_of(volume, run, set.owners_among.has_value(), set.has_types));
    }
  }
  for (LargeFolder& folder : tallies.largest_folders()) {
    set.shares[folder.share].folders.push_back(
        {std::move(folder.folder), tallies.shares()[folder.share].volumes()[folder.volume].volume,
         folder.amount});
  }
  if (run.quotas) {
    set.quotas = run.quotas->all();
  }
  return set;
}

std::optional<VolumeGrowth> growth_on(const Growth& growth, const std::string& volume) {
  const GrowthSince* since = longest_of(growth);
  if (since == nullptr) {
    return std::nullopt;
  }
  VolumeGrowth found{since->time, 0, {}};
  std::vector<Cause> folders;
  Sums owners;
  const std::set<std::string> elsewhere = shares_elsewhere(*since, volume);
  for (const Change& change : since->changes) {
    if (change.volume != volume) {
      continue;
    }
    if (change.kind == GrowthKind::kShare) {
      found.bytes = bounded_sum(found.bytes, change.bytes);
      found.causes.push_back({"share", change.share, "", change.bytes, {}});
    } else if (change.kind == GrowthKind::kOwner) {
      owners[change.name] = bounded_sum(owners[change.name], change.bytes);
    } else if (change.kind != GrowthKind::kType && change.name != "." &&
               !elsewhere.contains(change.share)) {
      folders.push_back({"folder", change.share, change.name, change.bytes, {}});
    }
  }
  add_owners(found.causes, owners);
  keep_nearest(folders);
  found.causes.insert(found.causes.end(), folders.begin(), folders.end());
  keep_greatest(found.causes, kMostCauses);
  for (Cause& cause : found.causes) {
    cause.name = facts_text(cause.name);
    cause.since = found.since;
  }
  return found;
}

std::vector<Cause> filled_by(const Tallies& tallies, const std::map<unsigned, std::string>* names,
                             const std::string& volume) {
  std::vector<Cause> causes;
  Sums owners;
  for (const ShareTally& share : tallies.shares()) {
    for (const VolumeTally& part : share.volumes()) {
      if (part.volume != volume) {
        continue;
      }
      causes.push_back({"share", share.name(), "", as_signed(part.total.bytes), {}});
      for (const auto& [uid, amount] : part.owners) {
        if (names != nullptr && names->contains(uid)) {
          int64_t& sum = owners[names->at(uid)];
          sum = bounded_sum(sum, as_signed(amount.bytes));
        }
      }
    }
  }
  add_owners(causes, owners);
  keep_greatest(causes, kMostCauses);
  return causes;
}

void add_grown(report_format::Facts& facts, const Growth& growth) {
  if (facts.shares) {
    add_grown_to(*facts.shares, &report_format::ShareFacts::name, growth, GrowthKind::kShare,
                 &Change::share);
  }
  if (facts.owners) {
    add_grown_to(*facts.owners, &report_format::OwnerFacts::name, growth, GrowthKind::kOwner,
                 &Change::name);
  }
  if (facts.types) {
    add_grown_to(*facts.types, &report_format::TypeFacts::type, growth, GrowthKind::kType,
                 &Change::name);
  }
}

void add_samples(report_format::Facts& facts, const SnapshotSamples& samples, const RunFacts& run) {
  if (facts.shares) {
    for (report_format::ShareFacts& share : *facts.shares) {
      if (share.whole) {
        share.samples = with_now(samples.shares, share.name, {run.started, share.bytes});
      }
    }
  }
  if (!facts.quotas) {
    return;
  }
  for (report_format::QuotaFacts& user : *facts.quotas) {
    const auto daily =
        with_now(samples.users, std::pair(user.volume, user.user), {run.started, user.used});
    user.forecast = forecast(daily, user.quota, user.quota - std::min(user.quota, user.used));
    user.level = quota_level(user.percent, &*user.forecast);
  }
  std::stable_sort(facts.quotas->begin(), facts.quotas->end(),
                   [](const auto& one, const auto& two) {
                     return std::tie(one.level, one.percent) > std::tie(two.level, two.percent);
                   });
}

}  // namespace vornreport
