// vornctl doctor: whether this machine has all that its runs need.
#include "doctor/doctor.hpp"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/ctl.hpp"
#include "doctor/commands.hpp"
#include "vorn/admin/messages.hpp"

namespace ctl {
namespace {

const char* word_for(Level level) {
  switch (level) {
    case Level::ok:
      return "ok";
    case Level::warning:
      return "warning";
    case Level::error:
      break;
  }
  return "error";
}

const char* sign_for(Level level) {
  switch (level) {
    case Level::ok:
      return "✓";
    case Level::warning:
      return "!";
    case Level::error:
      break;
  }
  return "✗";
}

void print_as_json(const Findings& findings) {
  auto array = nlohmann::ordered_json::array();
  for (const Finding& finding : findings.all()) {
    array.push_back({{"level", word_for(finding.level)},
                     {"subject", finding.subject},
                     {"text", finding.text},
                     {"remedy", finding.remedy}});
  }
  print_json(array);
}

void print_as_lines(const Findings& findings) {
  constexpr std::size_t kWordWidth = 8;
  for (const Finding& finding : findings.all()) {
    std::string word = word_for(finding.level);
    word.resize(kWordWidth, ' ');
    print_line(std::string(sign_for(finding.level)) + " " + word + finding.subject + ": " +
               finding.text + (finding.remedy.empty() ? "" : "; " + finding.remedy));
  }
}

void doctor(bool json) {
  Findings findings;
  check_product(findings);
  const Configuration configuration = check_configuration(findings);
  check_shares(findings, configuration);
  check_quota_tool(findings, configuration);
  check_mail(findings, configuration);
  check_space(findings, configuration);
  check_clock(findings);
  check_schedules(findings, configuration);
  check_last_runs(findings, configuration);
  admin::take_messages();  // every one of them has a finding
  json ? print_as_json(findings) : print_as_lines(findings);
  const auto is_error = [](const Finding& finding) { return finding.level == Level::error; };
  if (std::any_of(findings.all().begin(), findings.all().end(), is_error)) {
    throw Failure("");  // the lines say it
  }
}

}  // namespace

void Findings::add(Level level, std::string subject, std::string text, std::string remedy) {
  constexpr std::string_view kSeparator = "; ";
  if (const std::size_t at = text.rfind(kSeparator); remedy.empty() && at != std::string::npos) {
    remedy = text.substr(at + kSeparator.size());
    text.resize(at);
  }
  all_.push_back({level, std::move(subject), std::move(text), std::move(remedy)});
}

void add_doctor_command(CLI::App& app) {
  auto json = std::make_shared<bool>(false);
  CLI::App* command = app.add_subcommand("doctor", "Check everything that a run needs");
  add_json_flag(*command, *json);
  command->callback([json] { doctor(*json); });
}

}  // namespace ctl
