#include "report_format/run_state.hpp"

#include <algorithm>
#include <array>
#include <charconv>
#include <nlohmann/json.hpp>
#include <utility>

namespace report_format {
namespace {

constexpr std::pair<const char*, std::int64_t RunStatus::*> kTimes[] = {
    {"started", &RunStatus::started},
    {"ended", &RunStatus::ended},
    {"report_started", &RunStatus::report_started},
    {"succeeded", &RunStatus::succeeded}};

constexpr std::array kPhases{"starting", "gathering", "reporting", "assembling", "publishing"};

// The value of a line "key = value", or nothing.
std::optional<std::string_view> value_in(std::string_view line, std::string_view key) {
  constexpr std::string_view kSign = " = ";
  if (!line.starts_with(key) || !line.substr(key.size()).starts_with(kSign)) {
    return std::nullopt;
  }
  return line.substr(key.size() + kSign.size());
}

}  // namespace

std::string status_text(const RunStatus& status) {
  std::string text = status.word + "\n";
  if (!status.report.empty()) {
    text +=
        "report = " + status.report + "\nincidents = " + std::to_string(status.incidents) + "\n";
  }
  if (status.mail_failed) {
    text += "mail = failed\n";
  }
  if (status.fleet_failed) {
    text += "fleet = failed\n";
  }
  for (const auto& [key, time] : kTimes) {
    text += status.*time > 0 ? key + (" = " + std::to_string(status.*time) + "\n") : "";
  }
  return text;
}

RunStatus status_of(std::string_view text) {
  RunStatus status;
  for (bool is_first = true; !text.empty(); is_first = false) {
    const std::string_view line = text.substr(0, text.find('\n'));
    text.remove_prefix(std::min(line.size() + 1, text.size()));
    if (is_first) {
      status.word = line;
    } else if (const auto report = value_in(line, "report")) {
      status.report = *report;
    } else if (const auto count = value_in(line, "incidents")) {
      std::from_chars(count->data(), count->data() + count->size(), status.incidents);
    } else if (value_in(line, "mail") == "failed") {
      status.mail_failed = true;
    } else if (value_in(line, "fleet") == "failed") {
      status.fleet_failed = true;
    }
    for (const auto& [key, time] : kTimes) {
      if (const auto value = is_first ? std::nullopt : value_in(line, key)) {
        std::from_chars(value->data(), value->data() + value->size(), status.*time);
      }
    }
  }
  return status;
}

std::string progress_text(const Progress& progress) {
  const nlohmann::ordered_json json{{"phase", kPhases[static_cast<std::size_t>(progress.phase)]},
                                    {"share", progress.share},
                                    {"files", progress.files},
                                    {"report", progress.report},
                                    {"number", progress.number},
                                    {"reports", progress.reports}};
  return json.dump(-1, ' ', true, nlohmann::ordered_json::error_handler_t::replace) + "\n";
}

std::optional<Progress> progress_of(std::string_view text) {
  const auto json = nlohmann::json::parse(text, nullptr, false);
  if (!json.is_object()) {
    return std::nullopt;
  }
  const auto text_in = [&](const char* key) {
    const auto found = json.find(key);
    return found != json.end() && found->is_string() ? found->get<std::string>() : std::string();
  };
  const auto number_in = [&]<typename Number>(const char* key, Number& number) {
    const auto found = json.find(key);
    const std::uint64_t value =
        found != json.end() && found->is_number_unsigned() ? found->get<std::uint64_t>() : 0;
    number = std::in_range<Number>(value) ? static_cast<Number>(value) : 0;
  };
  const auto phase = std::find(kPhases.begin(), kPhases.end(), text_in("phase"));
  if (phase == kPhases.end()) {
    return std::nullopt;
  }
  Progress progress;
  progress.phase = static_cast<Phase>(phase - kPhases.begin());
  progress.share = text_in("share");
  number_in("files", progress.files);
  progress.report = text_in("report");
  number_in("number", progress.number);
  number_in("reports", progress.reports);
  return progress;
}

}  // namespace report_format
