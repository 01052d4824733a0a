// What the two configuration files say.
#include <algorithm>
#include <map>

#include "base/ctl.hpp"
#include "config/checks.hpp"
#include "doctor/doctor.hpp"
#include "vorn/admin/messages.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

// The platform's messages and vornctl's failures end in what to do.
void add_failure(Findings& findings, const std::string& subject, const std::string& message) {
  findings.add(Level::error, subject, message);
}

// The sections of `file`, those with a broken line included. Every line that can't be understood
// is an error, because a run does without the whole section.
std::vector<Section> check_lines(Findings& findings, const char* file) {
  auto found = admin::examine_file(file);
  if (!found) {
    add_failure(findings, file, host_failure("can't be read").what());
    return {};
  }
  for (const admin::WrongLine& line : found->wrong) {
    findings.add(Level::error, file, "line " + std::to_string(line.number) + ": " + line.problem,
                 "correct line " + std::to_string(line.number) + " of " + file + " first");
  }
  const std::size_t count = found->sections.size();
  if (found->wrong.empty()) {
    findings.ok(file, std::to_string(count) + (count == 1 ? " section" : " sections"));
  }
  return std::move(found->sections);
}

// What to do about a section: the command, which can't change one that has a broken line.
std::string remedy_for(const char* file, const Section& section, const std::string& command) {
  return admin::read_section(file, section.name) ? "run " + command
                                                 : "correct the lines of " + std::string(file) +
                                                       " that are told above, then run " + command;
}

// What to do about a key that means nothing; `command` changes keys of its section.
std::string remedy_for_key(const char* file, const Section& section, const std::string& command,
                           const std::string& key, const std::vector<std::string>& known) {
  const std::string near = suggestion(key, known);
  const std::string unset = remedy_for(file, section, command + " " + shell_word(key) + " ''");
  return near.empty() ? unset : near.substr(2) + " To unset it " + unset;
}

std::string set_command(const char* group, const Section& section) {
  return "vornctl " + std::string(group) + " set " + shell_word(section.name);
}

// The number of findings.
int check_entry(Findings& findings, const std::string& subject, const Section& section,
                const std::string& key, const std::string& value) {
  std::vector<std::string> names;
  for (const ProfileKey& known : profile_keys()) {
    names.emplace_back(known.name);
  }
  const std::string command = set_command("profile", section);
  if (std::find(names.begin(), names.end(), key) == names.end()) {
    findings.add(Level::warning, subject, "the key " + key + " means nothing",
                 remedy_for_key(VORN_PATH_CONFIG, section, command, key, names));
    return 1;
  }
  try {
    checked_value(profile_key(key), value);
    return 0;
  } catch (const Failure& failure) {
    // What to do ends the message, unless the section has to be put right before.
    constexpr std::string_view kSeparator = "; ";
    const std::string text = failure.what();
    const std::size_t at = text.rfind(kSeparator);
    const std::string set = command + " " + key + " VALUE";
    const bool is_told =
        at != std::string::npos && admin::read_section(VORN_PATH_CONFIG, section.name);
    findings.add(Level::error, subject, text.substr(0, at),
                 is_told ? text.substr(at + kSeparator.size()) + " (" + set + ")"
                         : remedy_for(VORN_PATH_CONFIG, section, set));
    return 1;
  }
}

void check_profile(Findings& findings, const Section& section) {
  const std::string subject = section.name == "global" ? "whole server" : "profile " + section.name;
  int problems = 0;
  for (const auto& [key, value] : section.entries) {
    problems += check_entry(findings, subject, section, key, value);
    admin::take_messages();  // those about other sections have findings of their own
  }
  const std::string reports = section.value("report_list");
  if (reports.empty()) {
    findings.add(
        Level::error, subject, "it selects no report",
        remedy_for(VORN_PATH_CONFIG, section,
                   set_command("profile", section) + " report_list share_list,large_file"));
  } else if (problems == 0) {
    findings.ok(subject, reports);
  }
  admin::take_messages();
}

void check_share_section(Findings& findings, const Section& section,
                         const std::vector<Share>& shares) {
  const std::string subject = "share " + section.name;
  const std::string command = set_command("share", section);
  if (const std::string problem = share_name_problem(section.name); !problem.empty()) {
    findings.add(Level::error, subject, "it is left out: " + problem,
                 remedy_for(VORN_PATH_SHARES, section, command + " --name NAME"));
    return;
  }
  const std::vector<std::string> known{"path", "file_index", "network"};
  for (const auto& [key, value] : section.entries) {
    if (std::find(known.begin(), known.end(), key) == known.end()) {
      findings.add(Level::warning, subject, "the key " + key + " means nothing",
                   remedy_for_key(VORN_PATH_SHARES, section, command, key, known));
    }
  }
  for (const Share& share : shares) {
    if (share.name == section.name && !share.path_error.empty()) {
      const std::string& problem = share.path_error;
      findings.add(Level::error, subject, problem.substr(0, problem.rfind("; ")),
                   remedy_for(VORN_PATH_SHARES, section, command + " --path FOLDER"));
    }
  }
  admin::take_messages();
}

}  // namespace

Configuration check_configuration(Findings& findings) {
  Configuration configuration;
  bool collects = false;
  for (Section& section : check_lines(findings, VORN_PATH_CONFIG)) {
    if (section.name == "global") {
      collects = true;
      check_profile(findings, section);
      continue;
    }
    try {
      check_profile_name(section.name);
    } catch (const Failure& failure) {
      add_failure(findings, "profile " + section.name, failure.what());
      continue;
    }
    check_profile(findings, section);
    configuration.profiles.push_back(std::move(section));
  }
  std::map<std::string, std::string> metrics;  // file to profile
  for (const Section& profile : configuration.profiles) {
    const std::string file = profile.value("metrics_file");
    if (const auto [other, is_new] = metrics.try_emplace(file, profile.name);
        !file.empty() && !is_new) {
      findings.add(
          Level::error, "profile " + profile.name,
          "its metrics_file is that of " + other->second + ", so each replaces the other's",
          "run vornctl profile set " + profile.name + " metrics_file with another file");
    }
  }
  if (!collects) {
    findings.add(Level::warning, "whole server", "without a section [global] no history is kept",
                 "run vornctl profile set global report_list volume_usage");
  }
  const std::vector<Section> sections = check_lines(findings, VORN_PATH_SHARES);
  configuration.shares = admin::read_shares().value_or(std::vector<Share>{});
  for (const Section& section : sections) {
    check_share_section(findings, section, configuration.shares);
  }
  if (configuration.shares.empty()) {
    findings.add(Level::warning, "shares", "there are none, so reports on files are empty",
                 "run vornctl share add NAME FOLDER");
  }
  admin::take_messages();  // those lines have their findings
  return configuration;
}

}  // namespace ctl
