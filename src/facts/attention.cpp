#include "facts/attention.hpp"

#include <algorithm>

#include "facts/forecast.hpp"
#include "facts/growth_facts.hpp"
#include "report_format/attention.hpp"
#include "report_format/reports.hpp"
#include "report_format/values.hpp"

namespace vornreport {
namespace {

using report_format::Attention;
using report_format::Facts;
using report_format::ForecastState;
using report_format::Level;

constexpr size_t kMostUsers = 3;

int64_t as_number(uint64_t value) {
  return static_cast<int64_t>(std::min<uint64_t>(value, INT64_MAX));
}

using Values = std::vector<std::pair<std::string, report_format::AttentionValue>>;

class List {
 public:
  void add(Level level, const char* code, Values values) {
    list_.push_back({level, code, std::move(values),
                     std::string(report_format::find_attention(code)->section)});
  }
  std::vector<Attention> sorted() {
    std::stable_sort(list_.begin(), list_.end(),
                     [](const auto& one, const auto& two) { return one.level > two.level; });
    return std::move(list_);
  }

 private:
  std::vector<Attention> list_;
};

// Whether its days alone give a volume a level, however much of it is used.
bool fills_up(const report_format::VolumeFacts& volume) {
  constexpr double kUseSaysNothing = 80;  // and days already say all they can
  return volume_level(std::min(volume.percent, kUseSaysNothing), volume.forecast) != Level::kOk;
}

void add_volume(List& list, const report_format::VolumeFacts& volume) {
  if (volume.level == Level::kOk) {
    return;
  }
  const report_format::Forecast& forecast = volume.forecast;
  const int64_t free = as_number(volume.free);
  if (forecast.state == ForecastState::kFull) {
    list.add(
        volume.level, "volume_full",
        {{"volume", volume.path}, {"percent", volume.percent}, {"used", as_number(volume.used)}});
  } else if (fills_up(volume)) {
    list.add(volume.level, "volume_fills",
             {{"volume", volume.path},
              {"days", forecast.days.value_or(0)},
              {"days_low", forecast.days_low.value_or(0)},
              {"days_high", forecast.days_high.value_or(0)},
              {"percent", volume.percent},
              {"free", free},
              {"window", forecast.window}});
  } else {
    list.add(volume.level, "volume_used",
             {{"volume", volume.path}, {"percent", volume.percent}, {"free", free}});
  }
}

// All users near or over their quotas, and those of the list that soon will be.
uint64_t pressing_users(const Facts& facts, const RunFacts& run) {
  return run.quotas->pressing() +
         static_cast<uint64_t>(
             std::count_if(facts.quotas->begin(), facts.quotas->end(), [](const auto& user) {
               return user.level != Level::kOk && quota_level(user.percent, nullptr) == Level::kOk;
             }));
}

void add_quotas(List& list, const Facts& facts, const RunFacts& run) {
  if (!facts.quotas) {
    return;
  }
  size_t told = 0;
  for (const report_format::QuotaFacts& user : *facts.quotas) {  // the most pressing first
    if (user.level == Level::kOk) {
      return;
    }
    if (told == kMostUsers) {
      list.add(user.level, "quota_more", {{"n", as_number(pressing_users(facts, run) - told)}});
      return;
    }
    ++told;
    list.add(user.level, user.percent > report_format::kOverQuota ? "quota_over" : "quota_near",
             {{"user", user.user},
              {"volume", user.volume},
              {"used", as_number(user.used)},
              {"quota", as_number(user.quota)},
              {"percent", user.percent}});
  }
}

// What accounts for at least half of the growth: the largest folder that does, else a share.
const report_format::Cause* main_cause(const VolumeGrowth& growth, std::string_view kind) {
  const auto found = std::find_if(growth.causes.begin(), growth.causes.end(), [&](const auto& one) {
    return one.kind == kind && one.bytes >= growth.bytes - growth.bytes / 2;
  });
  return found == growth.causes.end() ? nullptr : &*found;
}

void add_growth(List& list, const std::string& volume, const VolumeGrowth& growth) {
  Values values{{"volume", report_format::facts_text(volume)},
                {"bytes", growth.bytes},
                {"date", growth.since}};
  const auto* place = main_cause(growth, "folder");
  place = place != nullptr ? place : main_cause(growth, "share");
  const auto* owner = main_cause(growth, "owner");
  if (place != nullptr) {
    values.emplace_back("place",
                        place->name.empty() ? place->share : place->share + "/" + place->name);
  }
  if (place != nullptr && owner != nullptr) {
    values.emplace_back("owner", owner->name);
  }
  list.add(Level::kOk,
           place == nullptr   ? "volume_grew"
           : owner == nullptr ? "volume_grew_in"
                              : "volume_grew_in_by",
           std::move(values));
}

// In the order of the volumes. Files that two shares hold would count twice.
void add_growth(List& list, const RunFacts& run) {
  if (!run.growth || sums_are_doubtful()) {
    return;
  }
  for (const MeasuredVolume& volume : run.volumes) {
    const auto growth = growth_on(*run.growth, volume.path);
    if (growth && growth->bytes > 0) {
      add_growth(list, volume.path, *growth);
    }
  }
}

bool has_report(const Facts& facts, const report_format::ReportFormat& report) {
  return std::any_of(facts.reports.begin(), facts.reports.end(),
                     [&](const auto& made) { return made.name == report.name && made.ok; });
}

// A sum that an incident makes doubtful is no superlative.
void add_largest(List& list, const Facts& facts) {
  if (sums_are_doubtful()) {
    return;
  }
  if (facts.shares && has_report(facts, report_format::kShareList) && !facts.shares->empty() &&
      facts.shares->front().bytes > 0) {
    const report_format::ShareFacts& share = facts.shares->front();
    list.add(Level::kOk, "share_largest",
             {{"share", share.name}, {"bytes", as_number(share.bytes)}});
  }
  if (facts.owners && !facts.owners->empty() && facts.owners->front().bytes > 0) {
    const report_format::OwnerFacts& owner = facts.owners->front();
    list.add(Level::kOk, "owner_most", {{"owner", owner.name}, {"bytes", as_number(owner.bytes)}});
  }
}

void add_oldest(List& list, const Facts& facts, const Tallies& tallies) {
  constexpr int64_t kOld = int64_t{90} * 86400;  // as the report has it
  const OldestFile& oldest = tallies.oldest();
  if (has_report(facts, report_format::kLeastModify) && !oldest.path.empty() &&
      oldest.mtime < facts.started - kOld) {
    const std::string name = oldest.path.substr(oldest.path.rfind('/') + 1);
    list.add(Level::kOk, "data_oldest",
             {{"date", int64_t{oldest.mtime}}, {"file", report_format::facts_text(name)}});
  }
}

}  // namespace

std::vector<Attention> attention_of(const Facts& facts, const RunFacts& run,
                                    const Tallies& tallies) {
  List list;
  for (const report_format::VolumeFacts& volume : facts.volumes) {
    add_volume(list, volume);
  }
  add_quotas(list, facts, run);
  add_growth(list, run);
  add_largest(list, facts);
  if (facts.duplicates && facts.duplicates->reclaimable > 0) {
    list.add(Level::kOk,
             facts.duplicates->by_content ? "duplicates_confirmed" : "duplicates_possible",
             {{"bytes", as_number(facts.duplicates->reclaimable)},
              {"groups", as_number(facts.duplicates->groups)}});
  }
  add_oldest(list, facts, tallies);
  return list.sorted();
}

}  // namespace vornreport
