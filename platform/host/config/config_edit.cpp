#include "config/config_edit.hpp"

#include <algorithm>

#include "base/host_log.hpp"
#include "config/config_file.hpp"
#include "config/config_lines.hpp"
#include "vorn/base/words.hpp"

namespace host {
namespace {

using Lines = std::vector<ConfigLine>;
using Pairs = std::vector<std::pair<std::string, std::string>>;

std::string_view line_end_of(const ConfigLine& line) {
  return line.bytes.ends_with("\r\n") ? "\r\n" : "\n";
}

std::string_view indent_of(const ConfigLine& line) {
  return line.bytes.substr(0, line.bytes.find(line.name));
}

std::string entry_line(std::string_view indent, std::string_view key, std::string_view value,
                       std::string_view line_end) {
  std::string line;
  line.append(indent).append(key).append(value.empty() ? " =" : " = ").append(value);
  return line.append(line_end);
}

// The entry of `key` that counts, or the end.
auto find_entry(const SectionEdit::Entries& entries, std::string_view key) {
  return std::find_if(entries.rbegin(), entries.rend(),
                      [key](const auto& entry) { return entry.first == key; });
}

// --- The three edits ----------------------------------------------------------------------------

std::string with_section(std::string_view text, const Lines& lines, const SectionEdit& edit) {
  const std::string_view line_end = lines.empty() ? "\n" : line_end_of(lines.front());
  std::string out(text);
  if (!out.empty() && !out.ends_with('\n')) {
    out += line_end;
  }
  if (!lines.empty() && !trimmed(lines.back().bytes).empty()) {
    out += line_end;
  }
  out.append("[").append(edit.section).append("]").append(line_end);
  for (const auto& [key, value] : edit.entries) {
    if (value) {
      out += entry_line("", key, *value, line_end);
    }
  }
  return out;
}

// The lines for keys that the section lacks so far, in the order in which they are given.
std::string new_lines(const Lines& lines, const SectionRange& range, const ConfigLine& like,
                      const SectionEdit::Entries& entries) {
  std::string out;
  std::vector<std::string_view> known;
  for (std::size_t i = range.header + 1; i < range.end; ++i) {
    known.push_back(lines[i].name);  // empty for lines that are no entries
  }
  for (const auto& [key, value] : entries) {
    if (std::find(known.begin(), known.end(), key) == known.end()) {
      known.push_back(key);
      const auto& last = find_entry(entries, key)->second;
      const std::string_view indent = like.kind == LineKind::entry ? indent_of(like) : "";
      out += last ? entry_line(indent, key, *last, line_end_of(like)) : "";
    }
  }
  return out;
}

std::string renamed(const ConfigLine& header, std::string_view name) {
  std::string out(header.bytes);
  out.replace(static_cast<std::size_t>(header.name.data() - header.bytes.data()),
              header.name.size(), name);
  return out;
}

std::string with_changes(const Lines& lines, const SectionRange& range, const SectionEdit& edit) {
  std::size_t last_key = range.header;
  for (std::size_t i = range.header + 1; i < range.end; ++i) {
    last_key = lines[i].kind == LineKind::entry ? i : last_key;
  }
  std::string out;
  for (std::size_t i = 0; i < lines.size(); ++i) {
    const ConfigLine& line = lines[i];
    const bool inside = i > range.header && i < range.end && line.kind == LineKind::entry;
    const auto entry = inside ? find_entry(edit.entries, line.name) : edit.entries.rend();
    if (i == range.header && !edit.new_name.empty()) {
      out += renamed(line, edit.new_name);
    } else if (entry == edit.entries.rend() || entry->second == line.value) {
      out += line.bytes;
    } else if (entry->second) {
      out += entry_line(indent_of(line), line.name, *entry->second, line_end_of(line));
    }
    if (i == last_key) {
      const std::string added = new_lines(lines, range, line, edit.entries);
      if (!added.empty() && !out.ends_with('\n')) {
        out += line_end_of(line);
      }
      out += added;
    }
  }
  return out;
}

bool is_blank(const ConfigLine& line) {
  return trimmed(line.bytes).empty();
}

std::string without_section(const Lines& lines, const SectionRange& range) {
  std::size_t end = range.header + 1;  // behind the last key
  for (std::size_t i = end; i < range.end; ++i) {
    end = lines[i].kind == LineKind::entry ? i + 1 : end;
  }
  // Of the blank lines before and behind it one kind is enough.
  std::size_t begin = range.header;
  while (end < lines.size() && is_blank(lines[end]) && (begin == 0 || is_blank(lines[begin - 1]))) {
    ++end;
  }
  while (end == lines.size() && begin > 0 && is_blank(lines[begin - 1])) {
    --begin;
  }
  std::string out;
  // A byte order mark belongs to the bytes of the first line.
  constexpr std::string_view kMark = "\xEF\xBB\xBF";
  if (begin == 0 && !lines.empty() && lines.front().bytes.starts_with(kMark)) {
    out = kMark;
  }
  for (std::size_t i = 0; i < lines.size(); ++i) {
    if (i < begin || i >= end) {
      out += lines[i].bytes;
    }
  }
  return out;
}

// --- Reading back -------------------------------------------------------------------------------

// Every section with its entries, and what no reader understands, in order.
std::vector<std::pair<std::string, Pairs>> content(const Lines& lines) {
  std::vector<std::pair<std::string, Pairs>> sections(1);
  for (const ConfigLine& line : lines) {
    if (line.kind == LineKind::header) {
      sections.emplace_back(line.name, Pairs{});
    } else if (line.kind == LineKind::entry) {
      sections.back().second.emplace_back(line.name, line.value);
    } else if (line.kind == LineKind::malformed) {
      sections.back().second.emplace_back("", line.bytes);
    }
  }
  return sections;
}

// The entries that the section shall have, in any order.
Pairs meant(Pairs entries, const SectionEdit::Entries& changes) {
  for (const auto& [key, value] : changes) {
    std::erase_if(entries, [&key = key](const auto& entry) { return entry.first == key; });
    if (const auto& last = find_entry(changes, key)->second) {
      entries.emplace_back(key, *last);
    }
  }
  std::sort(entries.begin(), entries.end());
  return entries;
}

bool reads_as_meant(const Lines& before, std::string_view new_text, const SectionEdit& edit) {
  auto old_sections = content(before);
  auto new_sections = content(parse_lines(new_text));
  const auto find = [](auto& sections, const std::string& name) {
    return std::find_if(sections.begin() + 1, sections.end(),
                        [&](const auto& section) { return section.first == name; });
  };
  const auto old_one = find(old_sections, edit.section);
  const auto new_one = find(new_sections, edit.new_name.empty() ? edit.section : edit.new_name);
  if ((new_one == new_sections.end()) != (edit.kind == SectionEdit::Kind::remove)) {
    return false;
  }
  if (new_one != new_sections.end()) {
    const bool was_there = old_one != old_sections.end();
    std::sort(new_one->second.begin(), new_one->second.end());
    if (new_one->second != meant(was_there ? old_one->second : Pairs{}, edit.entries)) {
      return false;
    }
    new_sections.erase(new_one);
  }
  if (old_one != old_sections.end()) {
    old_sections.erase(old_one);
  }
  return old_sections == new_sections;
}

bool has_section(const Lines& lines, std::string_view name) {
  return std::any_of(lines.begin(), lines.end(), [name](const ConfigLine& line) {
    return line.kind == LineKind::header && line.name == name;
  });
}

}  // namespace

std::optional<std::string> edited_text(const char* file, std::string_view text,
                                       const SectionEdit& edit) {
  const Lines lines = parse_lines(text);
  std::string out;
  const bool is_new = edit.kind == SectionEdit::Kind::add;
  const std::string& made = is_new ? edit.section : edit.new_name;
  if (!made.empty() && (is_new || made != edit.section) && has_section(lines, made)) {
    log_line("%s has a section [%s] already; it is unchanged", file, made.c_str());
    return std::nullopt;
  }
  if (is_new) {
    out = with_section(text, lines, edit);
  } else {
    SectionRange range;
    const FindResult result = find_section(lines, file, edit.section, range);
    if (result == FindResult::missing) {
      log_line("%s has no section [%s]; it is unchanged", file, edit.section.c_str());
    }
    if (result != FindResult::found) {
      return std::nullopt;
    }
    out = edit.kind == SectionEdit::Kind::change ? with_changes(lines, range, edit)
                                                 : without_section(lines, range);
  }
  if (!reads_as_meant(lines, out, edit)) {
    log_line("%s: section [%s] is unchanged: a name or value would not read back from its line",
             file, edit.section.c_str());
    return std::nullopt;
  }
  return out;
}

int edit_section(const char* file, const SectionEdit& edit) {
  return rewrite_config(file, [&](std::string_view text) { return edited_text(file, text, edit); });
}

}  // namespace host
