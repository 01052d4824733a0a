#include "facts/run_facts.hpp"

#include <algorithm>
#include <ctime>
#include <iterator>

#include "facts/forecast.hpp"
#include "report_format/values.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/facts";

}  // namespace

void QuotaTally::add(std::string volume, std::string user, uint64_t used, uint64_t quota) {
  if (quota == 0) {
    return;
  }
  all_.push_back({volume, user, used, quota});
  report_format::QuotaFacts facts;
  facts.volume = std::move(volume);
  facts.user = std::move(user);
  facts.used = used;
  facts.quota = quota;
  facts.percent = static_cast<double>(used) * 100.0 / static_cast<double>(quota);
  facts.level = quota_level(facts.percent, nullptr);
  pressing_ += facts.level != report_format::Level::kOk ? 1 : 0;
  keep(std::move(facts));
}

void QuotaTally::add(QuotaTally&& other) {
  std::move(other.all_.begin(), other.all_.end(), std::back_inserter(all_));
  pressing_ += other.pressing_;
  for (const report_format::QuotaFacts& facts : other.users_) {
    keep(facts);
  }
}

std::vector<report_format::QuotaFacts> QuotaTally::users() const {
  return {users_.begin(), users_.end()};
}

// Behind those that are as pressing.
void QuotaTally::keep(report_format::QuotaFacts facts) {
  users_.insert(std::move(facts));
  if (users_.size() > kMostUsers) {
    users_.erase(std::prev(users_.end()));
  }
}

RunFacts& run_facts() {
  static RunFacts facts;
  return facts;
}

void begin_facts(const char* profile, const VLIBCSzHash* profile_hash) {
  RunFacts& facts = run_facts();
  facts.profile = profile;
  facts.started = std::time(nullptr);
  const char* limit_user = set_value(profile_hash, "limit_user");
  ListHandle names(VLIBCSzListAlloc(kPlatformSlots));
  if (limit_user == nullptr || !names) {
    return;
  }
  with_address(names, [&](VLIBCSzList** list) { return VLIBCStrTok(limit_user, ",", list); });
  facts.limit_user.emplace();
  for (int i = 0; i < VLIBCSzListCount(names.get()); ++i) {
    facts.limit_user->insert(VLIBCSzListGet(names.get(), i));
  }
}

void note_volumes(const VORNMountVolInfo* volumes) {
  std::vector<MeasuredVolume>& noted = run_facts().volumes;
  noted.clear();
  const int64_t now = std::time(nullptr);
  for (; volumes != nullptr; volumes = volumes->next) {
    if (!is_unset(volumes->path)) {
      noted.push_back({volumes->path, volumes->total_size, volumes->free_size, now});
    }
  }
}

void record_incident(const char* kind, const std::string& what, const std::string& text,
                     AlreadyLogged logged) {
  const report_format::IncidentKind* known = report_format::find_incident_kind(kind);
  if (known != nullptr && add_incident({known->level, kind, what, text}) &&
      logged == AlreadyLogged::kNo) {
    REPORT_LOG_ERR(kModule, __LINE__, "%s\n", text.c_str());
  }
}

bool add_incident(report_format::Incident incident) {
  std::vector<report_format::Incident>& incidents = run_facts().incidents;
  incident.what = report_format::facts_text(incident.what);
  incident.text = report_format::facts_text(incident.text);
  const bool is_new = std::none_of(incidents.begin(), incidents.end(), [&](const auto& before) {
    return before.kind == incident.kind && before.what == incident.what;
  });
  if (is_new) {
    incidents.push_back(std::move(incident));
  }
  return is_new;
}

void tell_failed_report(const char* name) {
  run_facts().failed.insert(name);
  record_incident("report_failed", name,
                  std::string("the report ") + name + " failed; the log says why",
                  AlreadyLogged::kYes);
}

void listen_for_incidents() {
  VornQazSetIncidentSink([](const char* kind, const char* what, const char* text) {
    record_incident(kind, what, text, AlreadyLogged::kYes);
  });
}

bool sums_are_doubtful() {
  const std::vector<report_format::Incident>& incidents = run_facts().incidents;
  return std::any_of(incidents.begin(), incidents.end(), [](const auto& incident) {
    const report_format::IncidentKind* known = report_format::find_incident_kind(incident.kind);
    return known == nullptr || known->spoils_sums;
  });
}

}  // namespace vornreport
