#include "base/configuration.hpp"

#include <algorithm>

#include "base/ctl.hpp"
#include "config/config_edit.hpp"
#include "config/config_file.hpp"
#include "config/config_lines.hpp"
#include "config/profile.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

using Lines = std::vector<host::ConfigLine>;

std::string read_text(const char* file) {
  const std::optional<std::string> text = host::read_config(file);
  if (!text) {
    throw host_failure(std::string(file) + " can't be read");
  }
  return *text;
}

std::optional<Section> section_of(const Lines& lines, const char* file, std::string_view name) {
  host::SectionRange range;
  if (host::find_section(lines, file, name, range) != host::FindResult::found) {
    return std::nullopt;
  }
  Section section{std::string(name), {}};
  for (std::size_t i = range.header + 1; i < range.end; ++i) {
    if (lines[i].kind == host::LineKind::entry) {
      section.entries.emplace_back(lines[i].name, lines[i].value);
    }
  }
  return section;
}

bool has_section(const Lines& lines, std::string_view name) {
  return std::any_of(lines.begin(), lines.end(), [name](const host::ConfigLine& line) {
    return line.kind == host::LineKind::header && line.name == name;
  });
}

void edit(const char* file, const host::SectionEdit& edit) {
  if (host::edit_section(file, edit) != 0) {
    throw host_failure(std::string(file) + " can't be changed");
  }
}

}  // namespace

const std::string* Section::find(std::string_view key) const {
  const auto found = std::find_if(entries.begin(), entries.end(),
                                  [key](const auto& entry) { return entry.first == key; });
  return found == entries.end() ? nullptr : &found->second;
}

std::string Section::value(std::string_view key, std::string_view otherwise) const {
  const std::string* found = find(key);
  return found == nullptr || found->empty() ? std::string(otherwise) : *found;
}

void check_profile_name(const std::string& name) {
  if (name == "global") {
    throw Failure("\"global\" stands for the whole server and is no profile; use another name");
  }
  if (!host::valid_profile(name.c_str()) || name.find('\0') != std::string::npos) {
    throw host_failure("this is no profile name");
  }
}

std::vector<Section> read_profiles() {
  const std::string text = read_text(VORN_PATH_CONFIG);
  const Lines lines = host::parse_lines(text);
  std::vector<Section> profiles;
  std::vector<std::string_view> seen;
  for (const host::ConfigLine& line : lines) {
    if (line.kind != host::LineKind::header || line.name == "global" ||
        std::find(seen.begin(), seen.end(), line.name) != seen.end()) {
      continue;
    }
    seen.push_back(line.name);
    if (!host::valid_profile(std::string(line.name).c_str())) {
      continue;  // a message says so
    }
    if (std::optional<Section> section = section_of(lines, VORN_PATH_CONFIG, line.name)) {
      profiles.push_back(std::move(*section));
    }
  }
  return profiles;
}

Section read_profile(const std::string& name) {
  if (name != "global") {
    check_profile_name(name);
  }
  const std::string text = read_text(VORN_PATH_CONFIG);
  if (std::optional<Section> section =
          section_of(host::parse_lines(text), VORN_PATH_CONFIG, name)) {
    return *section;
  }
  throw host_failure("profile \"" + name +
                     "\" is not in " VORN_PATH_CONFIG "; see vornctl profile list");
}

bool profile_exists(const std::string& name) {
  const std::string text = read_text(VORN_PATH_CONFIG);
  return has_section(host::parse_lines(text), name);
}

std::vector<host::Share> read_shares() {
  std::optional<std::vector<host::Share>> shares = host::load_shares(VORN_PATH_SHARES);
  if (!shares) {
    throw host_failure(VORN_PATH_SHARES " can't be read");
  }
  return std::move(*shares);
}

void add_section(const char* file, const std::string& name, const Changes& entries) {
  edit(file, {host::SectionEdit::Kind::add, name, entries});
}

void change_section(const char* file, const std::string& name, const Changes& changes) {
  edit(file, {host::SectionEdit::Kind::change, name, changes});
}

void remove_section(const char* file, const std::string& name) {
  edit(file, {host::SectionEdit::Kind::remove, name, {}});
}

}  // namespace ctl
