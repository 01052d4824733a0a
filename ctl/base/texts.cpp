#include "base/texts.hpp"

#include <iomanip>
#include <sstream>
#include <string_view>

#include "vorn/paths.h"

namespace ctl {
namespace {

std::string local_text(const char* format, std::time_t time) {
  std::tm local{};
  localtime_r(&time, &local);
  std::ostringstream text;
  text << std::put_time(&local, format);
  return text.str();
}

}  // namespace

const char* word_for(admin::RunState state) {
  switch (state) {
    case admin::RunState::never_ran:
      return "never ran";
    case admin::RunState::running:
      return "running";
    case admin::RunState::succeeded:
      return "success";
    case admin::RunState::failed:
      return "fail";
    case admin::RunState::ended_early:
      return "ended early";
    case admin::RunState::unknown:
      break;
  }
  return "unknown";
}

std::string unsent_mail(const std::string& profile) {
  return "the mail of the last report reached nobody; run vornctl profile test-mail " + profile;
}

std::string missing_from_fleet(const std::string& profile) {
  return "the last report is missing from the fleet, the system log says why; run vornctl run " +
         profile + " when the engine answers";
}

std::string overdue_text(std::time_t begun, std::time_t due) {
  constexpr std::time_t kDay = 86400;
  const std::time_t days = (std::time(nullptr) - begun) / kDay;
  const std::string since =
      begun == 0 ? "no run yet"
                 : "no run for " + std::to_string(days) + (days == 1 ? " day" : " days");
  return since + ", though one was due at " + time_text(due);
}

const report_format::Texts& english() {
  static const report_format::Texts texts(VORN_PATH_TEMPLATE "/lang", "en");
  return texts;
}

std::string size_text(std::uint64_t bytes) {
  constexpr std::string_view kNoBreak = "\u00a0";
  std::string text = english().size(bytes);
  if (const std::size_t blank = text.find(kNoBreak); blank != std::string::npos) {
    text.replace(blank, kNoBreak.size(), " ");
  }
  return text;
}

std::string time_text(std::time_t time) {
  return local_text("%Y-%m-%d %H:%M", time);
}

std::string json_time(std::time_t time) {
  return local_text("%Y-%m-%dT%H:%M:%S%z", time);
}

}  // namespace ctl
