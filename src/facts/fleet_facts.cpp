#include "facts/fleet_facts.hpp"

#include <algorithm>
#include <map>
#include <optional>
#include <set>
#include <tuple>
#include <utility>

#include "facts/amount.hpp"
#include "facts/attention.hpp"
#include "facts/growth_facts.hpp"
#include "facts/tallies.hpp"
#include "report_format/reports.hpp"

namespace vornreport {
namespace {

using report_format::Facts;

template <typename List>
void append(std::optional<List>& all, std::optional<List>&& more) {
  if (!more) {
    return;
  }
  if (!all) {
    all.emplace();
  }
  std::move(more->begin(), more->end(), std::back_inserter(*all));
}

template <typename List>
void sort_by_size(std::optional<List>& list) {
  if (list) {
    std::stable_sort(list->begin(), list->end(),
                     [](const auto& one, const auto& two) { return one.bytes > two.bytes; });
  }
}

// Of a part that nothing is known of, nothing is known of the sum.
void add(std::optional<report_format::GrownSince>& sum,
         const std::optional<report_format::GrownSince>& more) {
  if (!sum || !more) {
    sum.reset();
    return;
  }
  sum->since = std::min(sum->since, more->since);
  sum->files = bounded_sum(sum->files, more->files);
  sum->bytes = bounded_sum(sum->bytes, more->bytes);
}

void add(std::optional<report_format::Grown>& sum,
         const std::optional<report_format::Grown>& more) {
  if (!sum || !more) {
    sum.reset();
    return;
  }
  add(sum->last, more->last);
  add(sum->week, more->week);
  add(sum->month, more->month);
}

template <typename Record>
void add_amount(Record& sum, const Record& more) {
  Amount amount{sum.files, sum.bytes};
  amount.add({more.files, more.bytes});
  sum.files = amount.files;
  sum.bytes = amount.bytes;
}

// Sums up those of one name; `name` and `parts` are members of the record. All parts stay: the page
// adds them up by share and volume.
template <typename Record, typename Part>
void merge(std::optional<std::vector<Record>>& list, std::string Record::*name,
           std::vector<Part> Record::*parts) {
  if (!list) {
    return;
  }
  std::map<std::string, size_t> places;
  std::vector<Record> merged;
  for (Record& record : *list) {
    const auto [place, is_new] = places.try_emplace(record.*name, merged.size());
    if (is_new) {
      merged.push_back(std::move(record));
      continue;
    }
    Record& sum = merged[place->second];
    add_amount(sum, record);
    add(sum.grown, record.grown);
    std::move((record.*parts).begin(), (record.*parts).end(), std::back_inserter(sum.*parts));
  }
  for (Record& record : merged) {
    std::stable_sort((record.*parts).begin(), (record.*parts).end(),
                     [](const auto& one, const auto& two) { return one.bytes > two.bytes; });
  }
  list = std::move(merged);
}

void name_causes(std::optional<std::vector<report_format::Cause>>& causes,
                 const std::string& server) {
  if (!causes) {
    return;
  }
  for (report_format::Cause& cause : *causes) {
    if (!cause.share.empty()) {
      cause.share = fleet_name(server, cause.share);
    }
  }
}

// From here on shares and volumes carry their server's name.
void name_parts(Facts& facts, const std::string& server) {
  const auto name = [&](std::string& text) { text = fleet_name(server, text); };
  for (report_format::VolumeFacts& volume : facts.volumes) {
    name(volume.path);
    volume.id = volume.path;
    name_causes(volume.filled_by, server);
    name_causes(volume.grown_by, server);
  }
  if (facts.shares) {
    for (report_format::ShareFacts& share : *facts.shares) {
      name(share.name);
      name(share.path);
      name(share.volume);
    }
  }
  if (facts.owners) {
    for (report_format::OwnerFacts& owner : *facts.owners) {
      for (report_format::OwnerPlace& place : owner.places) {
        name(place.share);
        name(place.volume);
      }
    }
  }
  if (facts.types) {
    for (report_format::TypeFacts& type : *facts.types) {
      for (report_format::TypeShare& share : type.shares) {
        name(share.share);
      }
    }
  }
  if (facts.quotas) {
    for (report_format::QuotaFacts& quota : *facts.quotas) {
      name(quota.volume);
    }
  }
  for (report_format::Attention& entry : facts.attention) {
    for (auto& [key, value] : entry.values) {
      if (auto* text = std::get_if<std::string>(&value);
          text != nullptr && (key == "volume" || key == "place" || key == "file")) {
        name(*text);
      }
    }
  }
}

void add_ages(Facts& all, const Facts& facts) {
  if (!facts.ages) {
    return;
  }
  if (!all.ages) {
    all.ages = facts.ages;
    return;
  }
  for (size_t i = 0; i < std::min(all.ages->size(), facts.ages->size()); ++i) {
    add_amount((*all.ages)[i], (*facts.ages)[i]);
  }
}

// What another profile of the server knows of a volume besides. `is_apart`: no share is in both.
void add_to_volume(report_format::VolumeFacts& volume, report_format::VolumeFacts&& more,
                   bool is_apart) {
  if (more.explained && (is_apart || !volume.explained)) {
    volume.explained = bounded_sum(volume.explained.value_or(0), *more.explained);
    volume.outside = static_cast<int64_t>(volume.used) - *volume.explained;
  }
  if (!volume.grown_by) {
    volume.grown_by = std::move(more.grown_by);
  }
  if (!more.filled_by) {
    return;
  }
  auto& causes = volume.filled_by ? *volume.filled_by : volume.filled_by.emplace();
  for (report_format::Cause& cause : *more.filled_by) {
    const auto known = std::find_if(causes.begin(), causes.end(), [&](const auto& one) {
      return std::tie(one.kind, one.share, one.name) ==
             std::tie(cause.kind, cause.share, cause.name);
    });
    if (known == causes.end()) {
      causes.push_back(std::move(cause));
    } else if (is_apart) {
      known->bytes = bounded_sum(known->bytes, cause.bytes);
    }
  }
  std::stable_sort(causes.begin(), causes.end(),
                   [](const auto& one, const auto& two) { return one.bytes > two.bytes; });
  causes.resize(std::min(causes.size(), kMostCauses));
}

// The volumes of all servers, each once.
class Volumes {
 public:
  void add(Facts& facts) {
    bool is_apart = true;
    if (facts.shares) {
      for (const report_format::ShareFacts& share : *facts.shares) {
        is_apart = shares_.insert(share.name).second && is_apart;
      }
    }
    for (report_format::VolumeFacts& volume : facts.volumes) {
      const auto [place, is_new] = places_.try_emplace(volume.path, list_.size());
      if (is_new) {
        list_.push_back(std::move(volume));
      } else {
        add_to_volume(list_[place->second], std::move(volume), is_apart);
      }
    }
  }
  std::vector<report_format::VolumeFacts> take() { return std::move(list_); }

 private:
  std::vector<report_format::VolumeFacts> list_;
  std::map<std::string, size_t> places_;  // by path
  std::set<std::string> shares_;          // of the servers so far
};

void bound_quotas(Facts& all, RunFacts& run) {
  if (!all.quotas) {
    return;
  }
  std::set<std::pair<std::string, std::string>> told;
  std::erase_if(*all.quotas,
                [&](const auto& user) { return !told.emplace(user.volume, user.user).second; });
  std::stable_sort(all.quotas->begin(), all.quotas->end(), [](const auto& one, const auto& two) {
    return std::tie(one.level, one.percent) > std::tie(two.level, two.percent);
  });
  run.quotas.emplace();
  for (const report_format::QuotaFacts& user : *all.quotas) {
    run.quotas->add(user.volume, user.user, user.used, user.quota);
  }
  all.quotas->resize(std::min(all.quotas->size(), QuotaTally::kMostUsers));
}

bool asks_for(const FactsSource& source, const report_format::ReportFormat& report) {
  return report_format::is_selected(report.name, source.report_list);
}

void forget_unasked(Facts& facts, const FactsSource& source) {
  const auto keep = [&](auto& list, const report_format::ReportFormat& report) {
    if (!asks_for(source, report)) {
      list.reset();
    }
  };
  keep(facts.owners, report_format::kFileOwner);
  keep(facts.types, report_format::kFileGroup);
  keep(facts.ages, report_format::kFileAge);
  keep(facts.quotas, report_format::kQuotaUsage);
  const auto keep_growth = [&](auto& list) {
    for (auto& record : *list) {
      record.grown.reset();
    }
  };
  for (report_format::VolumeFacts& volume : facts.volumes) {
    keep(volume.grown_by, report_format::kGrowth);
    keep(volume.explained, report_format::kCoverage);
    keep(volume.outside, report_format::kCoverage);
    if (!asks_for(source, report_format::kFileOwner)) {
      for (auto* causes : {&volume.filled_by, &volume.grown_by}) {
        if (*causes) {
          std::erase_if(**causes, [](const auto& cause) { return cause.kind == "owner"; });
        }
      }
    }
  }
  if (!asks_for(source, report_format::kGrowth)) {
    facts.shares ? keep_growth(facts.shares) : void();
    facts.owners ? keep_growth(facts.owners) : void();
    facts.types ? keep_growth(facts.types) : void();
  }
}

std::string volume_of(const report_format::Attention& entry) {
  const auto* value = entry.find("volume");
  const auto* volume = value != nullptr ? std::get_if<std::string>(value) : nullptr;
  return volume != nullptr ? *volume : "";
}

// What only the servers themselves can tell: what grew, and the oldest file of all.
void add_attention(Facts& all, const std::vector<FleetMember>& members, const FactsSource& source) {
  std::optional<report_format::Attention> oldest;
  std::set<std::string> grown;  // volumes of which that is told
  const auto date_of = [](const report_format::Attention& entry) {
    const auto* date = entry.find("date");
    const auto* number = date != nullptr ? std::get_if<int64_t>(date) : nullptr;
    return number != nullptr ? *number : INT64_MAX;
  };
  for (const FleetMember& member : members) {
    for (const report_format::Attention& entry : member.facts.attention) {
      if (entry.code.starts_with("volume_grew") && asks_for(source, report_format::kGrowth) &&
          (asks_for(source, report_format::kFileOwner) || entry.code != "volume_grew_in_by") &&
          grown.insert(volume_of(entry)).second) {
        all.attention.push_back(entry);
      } else if (entry.code == "data_oldest" && asks_for(source, report_format::kLeastModify) &&
                 (!oldest || date_of(entry) < date_of(*oldest))) {
        oldest = entry;
      }
    }
  }
  if (oldest) {
    all.attention.push_back(*oldest);
  }
  std::stable_sort(all.attention.begin(), all.attention.end(),
                   [](const auto& one, const auto& two) { return one.level > two.level; });
}

}  // namespace

std::string fleet_name(const std::string& server, const std::string& name) {
  return report_format::facts_text(server) + ":" + name;
}

void take_over_incidents(const std::vector<FleetMember>& members) {
  for (const FleetMember& member : members) {
    for (const report_format::Incident& incident : member.facts.incidents) {
      add_incident({incident.level, incident.kind, fleet_name(member.server, " " + incident.what),
                    fleet_name(member.server, " " + incident.text)});
    }
  }
}

Facts fleet_facts(std::vector<FleetMember> members, RunFacts& run, const FactsSource& source) {
  Facts all;
  Volumes volumes;
  for (FleetMember& member : members) {
    Facts& facts = member.facts;
    name_parts(facts, member.server);
    volumes.add(facts);
    append(all.shares, std::move(facts.shares));
    append(all.owners, std::move(facts.owners));
    append(all.types, std::move(facts.types));
    append(all.quotas, std::move(facts.quotas));
    add_ages(all, facts);
  }
  all.host = source.host;
  all.profile = run.profile;
  all.time_zone = source.time_zone;
  all.language = run.language;
  all.started = run.started;
  all.finished = source.now;
  all.incidents = run.incidents;
  all.complete = std::none_of(run.incidents.begin(), run.incidents.end(), [](const auto& incident) {
    return incident.level == report_format::IncidentLevel::kError;
  });
  all.volumes = volumes.take();
  forget_unasked(all, source);
  put_pressing_first(all.volumes);
  merge(all.owners, &report_format::OwnerFacts::name, &report_format::OwnerFacts::places);
  merge(all.types, &report_format::TypeFacts::type, &report_format::TypeFacts::shares);
  sort_by_size(all.shares);
  sort_by_size(all.owners);
  sort_by_size(all.types);
  bound_quotas(all, run);
  all.duplicates = run.duplicates;
  all.reports = reports_of(run, source);
  all.attention = attention_of(all, run, Tallies());
  add_attention(all, members, source);
  return all;
}

}  // namespace vornreport
