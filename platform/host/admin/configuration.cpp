#include "vorn/admin/configuration.hpp"

#include <algorithm>
#include <set>

#include "config/config_edit.hpp"
#include "config/config_file.hpp"
#include "config/config_lines.hpp"
#include "config/profile.hpp"
#include "vorn/paths.h"

namespace admin {
namespace {

using Lines = std::vector<host::ConfigLine>;

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

bool edit(const std::string& file, const host::SectionEdit& edit) {
  return host::edit_section(file.c_str(), edit) == 0;
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

bool is_profile_name(const std::string& name) {
  return host::valid_profile(name.c_str()) && name.find('\0') == std::string::npos;
}

std::optional<std::vector<Section>> read_profiles() {
  const std::optional<std::string> text = host::read_config(VORN_PATH_CONFIG);
  if (!text) {
    return std::nullopt;
  }
  const Lines lines = host::parse_lines(*text);
  std::vector<Section> profiles;
  std::set<std::string_view> seen{"global"};
  for (const host::ConfigLine& line : lines) {
    if (line.kind == host::LineKind::header && seen.insert(line.name).second &&
        is_profile_name(std::string(line.name))) {
      if (auto section = section_of(lines, VORN_PATH_CONFIG, line.name)) {
        profiles.push_back(std::move(*section));
      }
    }
  }
  return profiles;
}

std::optional<Section> read_section(const std::string& file, const std::string& name) {
  const std::optional<std::string> text = host::read_config(file.c_str());
  return text ? section_of(host::parse_lines(*text), file.c_str(), name) : std::nullopt;
}

std::optional<ConfigFile> examine_file(const std::string& file) {
  const std::optional<std::string> text = host::read_config(file.c_str());
  if (!text) {
    return std::nullopt;
  }
  ConfigFile found;
  std::set<std::string_view> names;
  std::set<std::string_view> keys;
  std::size_t number = 0;
  for (const host::ConfigLine& line : host::parse_lines(*text)) {
    ++number;
    const char* problem = line.problem;
    if (line.kind == host::LineKind::header) {
      keys.clear();
      problem = names.insert(line.name).second ? nullptr : host::kRepeatedSection;
      found.sections.push_back({std::string(line.name), {}});
    } else if (line.kind == host::LineKind::entry && found.sections.empty()) {
      problem = "it stands above every section";
    } else if (line.kind == host::LineKind::entry) {
      problem = keys.insert(line.name).second ? nullptr : host::kRepeatedKey;
      found.sections.back().entries.emplace_back(line.name, line.value);
    }
    if (problem != nullptr) {
      found.wrong.push_back({number, problem});
    }
  }
  return found;
}

bool add_section(const std::string& file, const std::string& name, const Changes& entries) {
  return edit(file, {host::SectionEdit::Kind::add, name, entries, {}});
}

bool change_section(const std::string& file, const std::string& name, const Changes& changes,
                    const std::string& new_name) {
  return edit(file, {host::SectionEdit::Kind::change, name, changes, new_name});
}

bool remove_section(const std::string& file, const std::string& name) {
  return edit(file, {host::SectionEdit::Kind::remove, name, {}, {}});
}

}  // namespace admin
