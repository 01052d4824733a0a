#include "outcome/metrics.hpp"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <set>
#include <utility>
#include <vector>

#include "base/host_log.hpp"
#include "base/trusted_folder.hpp"
#include "report_format/values.hpp"
#include "vorn/base/file_io.hpp"

namespace host {
namespace {

using report_format::Facts;
using Labels = std::vector<std::pair<const char*, std::string>>;

// Facts are UTF-8, as the format wants it.
std::string label_value(std::string_view text) {
  std::string value;
  for (const char c : text) {
    if (c == '\\' || c == '"') {
      value += '\\';
    }
    value += c == '\n' ? std::string("\\n") : std::string(1, c);
  }
  return value;
}

std::string number(std::int64_t value) {
  return std::to_string(value);
}

// The families of metrics, each with its samples behind its description. All are gauges and carry
// the profile, so that files of several profiles don't contradict each other. Two samples of one
// name would cost the whole file, so of paths that facts write alike (a byte that is no UTF-8, and
// four characters that look like it) only the first has one.
class Families {
 public:
  explicit Families(std::string profile) : profile_(std::move(profile)) {}

  void begin(const char* name, const char* help) {
    name_ = std::string("vornreport_") + name;
    pending_ = "# HELP " + name_ + " " + help + "\n# TYPE " + name_ + " gauge\n";
    samples_.clear();
  }
  void add(const std::string& value, const Labels& labels = {}) {
    std::string sample = name_ + "{profile=\"" + label_value(profile_) + '"';
    for (const auto& [label, of] : labels) {
      sample += std::string(",") + label + "=\"" + label_value(of) + '"';
    }
    if (samples_.insert(sample).second) {
      text_ += std::exchange(pending_, {}) + sample + "} " + value + "\n";
    }
  }
  std::string take() { return std::move(text_); }

 private:
  std::string profile_;
  std::string name_;
  std::string pending_;            // of a family without samples nothing is said
  std::set<std::string> samples_;  // of this family, up to their labels
  std::string text_;
};

void add_run(Families& families, const report_format::RunStatus& status) {
  families.begin("last_run_timestamp_seconds", "When the last report run ended.");
  families.add(number(status.ended));
  families.begin("last_run_duration_seconds", "How long the last report run took.");
  families.add(number(std::max<std::int64_t>(status.ended - status.started, 0)));
  families.begin("last_run_success",
                 "Whether the last report run made a report (1) or failed (0).");
  families.add(status.word == report_format::kSuccess ? "1" : "0");
  families.begin("last_success_timestamp_seconds",
                 "When the last report run ended that made a report.");
  if (status.succeeded > 0) {
    families.add(number(status.succeeded));
  }
}

void add_volumes(Families& families, const Facts& facts) {
  const auto each = [&](const char* name, const char* help, const auto& value) {
    families.begin(name, help);
    for (const report_format::VolumeFacts& volume : facts.volumes) {
      families.add(value(volume), {{"volume", volume.path}});
    }
  };
  each("volume_size_bytes", "Size of a volume: what is used or free for users.",
       [](const auto& volume) { return std::to_string(volume.size); });
  each("volume_used_bytes", "What is used of a volume.",
       [](const auto& volume) { return std::to_string(volume.used); });
  each("volume_level", "How pressing a volume is: 0 ok, 1 warning, 2 critical.",
       [](const auto& volume) { return std::to_string(static_cast<int>(volume.level)); });
  families.begin(
      "volume_full_in_seconds",
      "Forecast of the time until a growing volume is full, from the newest report on, and "
      "the bounds of its range. Absent for a volume that does not grow.");
  constexpr std::int64_t kDay = 86400;
  for (const report_format::VolumeFacts& volume : facts.volumes) {
    const report_format::Forecast& forecast = volume.forecast;
    const bool is_full = forecast.state == report_format::ForecastState::kFull;
    for (const auto& [bound, days] : {std::pair("low", forecast.days_low),
                                      {"mid", forecast.days},
                                      {"high", forecast.days_high}}) {
      if (is_full || days) {
        families.add(number(is_full ? 0 : *days * kDay),
                     {{"volume", volume.path}, {"bound", bound}});
      }
    }
  }
}

void add_shares(Families& families, const std::vector<report_format::ShareFacts>& shares) {
  families.begin("share_size_bytes", "Sum of the sizes of a share's files.");
  for (const auto& share : shares) {
    families.add(std::to_string(share.bytes), {{"share", share.name}});
  }
  families.begin("share_files", "Number of a share's files.");
  for (const auto& share : shares) {
    families.add(std::to_string(share.files), {{"share", share.name}});
  }
  families.begin("share_growth_bytes",
                 "Change of a share's size since the last report, a week ago and a month ago.");
  for (const auto& share : shares) {
    if (share.grown) {
      for (const auto& [since, grown] : {std::pair("last", share.grown->last),
                                         {"week", share.grown->week},
                                         {"month", share.grown->month}}) {
        if (grown) {
          families.add(number(grown->bytes), {{"share", share.name}, {"since", since}});
        }
      }
    }
  }
}

void add_quotas(Families& families, const std::vector<report_format::QuotaFacts>& quotas) {
  constexpr double kPercent = 100;
  families.begin("quota_used_ratio",
                 "Part of the soft limit that a user has used on a volume, of the users nearest to "
                 "theirs or over it.");
  for (const auto& quota : quotas) {
    char ratio[32];
    std::snprintf(ratio, sizeof ratio, "%.6g", quota.percent / kPercent);
    families.add(ratio, {{"volume", quota.volume}, {"user", quota.user}});
  }
}

void add_report(Families& families, const Facts& facts) {
  families.begin("report_timestamp_seconds",
                 "When the newest report was made, which figures of volumes and shares are of.");
  families.add(number(facts.finished));
  families.begin("report_incidents", "What the newest report lacks or doubts, by kind.");
  for (const report_format::IncidentKind& kind : report_format::kIncidentKinds) {
    const auto count = std::count_if(facts.incidents.begin(), facts.incidents.end(),
                                     [&](const auto& each) { return each.kind == kind.kind; });
    families.add(number(count), {{"kind", std::string(kind.kind)}});
  }
}

// The folder that the file is to stand in; its own name is put into `name`.
TrustedFolder open_folder_of(const std::string& file, std::string& name) {
  const std::size_t slash = file.rfind('/');
  name = file.substr(slash + 1);
  return open_trusted(file.substr(0, slash + 1), Missing::refused, Strangers::not_followed);
}

bool replace_file(const Fd& folder, const std::string& name, const std::string& text) {
  constexpr mode_t kForEveryone = 0644;
  const std::string path = "/proc/self/fd/" + std::to_string(folder.get()) + "/" + name;
  AtomicFile::remove_leftovers(path);
  AtomicFile file(path);
  return file.fd() >= 0 && fchmod(file.fd(), kForEveryone) == 0 && write_all(file.fd(), text) &&
         file.commit();
}

}  // namespace

std::string metrics_text(const std::string& profile, const report_format::RunStatus& status,
                         const std::optional<Facts>& facts, bool with_users) {
  Families families(profile);
  add_run(families, status);
  if (facts) {
    add_report(families, *facts);
    add_volumes(families, *facts);
    if (facts->shares) {
      add_shares(families, *facts->shares);
    }
    if (with_users && facts->quotas) {
      add_quotas(families, *facts->quotas);
    }
  }
  return families.take();
}

void write_metrics(const std::string& profile, const VLIBCSzHash& settings,
                   const report_format::RunStatus& status, const std::optional<Facts>& facts) {
  const ErrnoKeeper keeper;
  const char* value = settings.find("metrics_file");
  if (value == nullptr || *value == '\0') {
    return;
  }
  if (const char* error = metrics_file_error(value); error != nullptr) {
    log_line(
        "profile \"%s\": metrics_file \"%.1100s\" %s; run vornctl profile set %s metrics_file "
        "/FOLDER/NAME.prom",
        profile.c_str(), value, error, profile.c_str());
    return;
  }
  const char* users = settings.find("metrics_users");
  std::string name;
  const TrustedFolder opened = open_folder_of(value, name);
  if (!opened.folder) {
    log_line(R"(profile "%s": metrics_file %s can't be written: %s)", profile.c_str(), value,
             opened.problem.empty() ? "its folder is missing; make it" : opened.problem.c_str());
  } else if (!replace_file(opened.folder, name,
                           metrics_text(profile, status, facts,
                                        users != nullptr && report_format::is_true(users)))) {
    log_line(
        R"(profile "%s": metrics_file %s can't be written (%s); vornctl doctor looks at its folder)",
        profile.c_str(), value, std::strerror(errno));
  }
}

const char* metrics_file_error(std::string_view value) {
  constexpr std::size_t kLongest = 1024;
  const std::string_view name = value.substr(value.rfind('/') + 1);
  if (!value.starts_with('/')) {
    return "is not absolute";
  }
  if (!name.ends_with(".prom") || name.starts_with('.')) {
    return "is no name that a node exporter reads; let it end in .prom and not begin with a dot";
  }
  if (value.size() > kLongest || (std::string(value) + "/").find("/../") != std::string::npos ||
      std::any_of(value.begin(), value.end(),
                  [](char c) { return static_cast<unsigned char>(c) < ' ' || c == '\x7f'; })) {
    return R"(is longer than 1024 bytes, or holds ".." or a control character)";
  }
  return nullptr;
}

std::string metrics_file_problem(const std::string& value) {
  const ErrnoKeeper keeper;
  std::string name;
  const TrustedFolder opened = open_folder_of(value, name);
  return opened.folder            ? ""
         : opened.problem.empty() ? "its folder is missing; make it"
                                  : opened.problem;
}

}  // namespace host
