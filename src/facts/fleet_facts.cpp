#include "facts/fleet_facts.hpp"

#include <algorithm>
#include <map>
#include <optional>
#include <tuple>
#include <utility>

#include "facts/amount.hpp"
#include "facts/attention.hpp"
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

// Sums up those of one name; `name` and `parts` are members of the record.
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
  for (report_format::Cause& cause : causes ? *causes : std::vector<report_format::Cause>{}) {
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

// Of two profiles of one server that tell of one volume, the first stays.
void drop_repeated_volumes(std::vector<report_format::VolumeFacts>& volumes) {
  std::map<std::string, int> seen;
  std::erase_if(volumes, [&](const auto& volume) { return ++seen[volume.path] > 1; });
}

void bound_quotas(Facts& all, RunFacts& run) {
  if (!all.quotas) {
    return;
  }
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

// What only the servers themselves can tell: what grew, and the oldest file of all.
void add_attention(Facts& all, const std::vector<FleetMember>& members, const FactsSource& source) {
  std::optional<report_format::Attention> oldest;
  const auto date_of = [](const report_format::Attention& entry) {
    const auto* date = entry.find("date");
    const auto* number = date != nullptr ? std::get_if<int64_t>(date) : nullptr;
    return number != nullptr ? *number : INT64_MAX;
  };
  for (const FleetMember& member : members) {
    for (const report_format::Attention& entry : member.facts.attention) {
      if (entry.code.starts_with("volume_grew") && asks_for(source, report_format::kGrowth) &&
          (asks_for(source, report_format::kFileOwner) || entry.code != "volume_grew_in_by")) {
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
      record_incident(incident.kind.c_str(), fleet_name(member.server, " " + incident.what),
                      fleet_name(member.server, " " + incident.text), AlreadyLogged::kYes);
    }
  }
}

Facts fleet_facts(std::vector<FleetMember> members, RunFacts& run, const FactsSource& source) {
  Facts all;
  for (FleetMember& member : members) {
    Facts& facts = member.facts;
    name_parts(facts, member.server);
    std::move(facts.volumes.begin(), facts.volumes.end(), std::back_inserter(all.volumes));
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
  forget_unasked(all, source);
  drop_repeated_volumes(all.volumes);
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
