#include "config/config_lines.hpp"

#include <algorithm>
#include <unordered_set>

#include "base/host_log.hpp"
#include "vorn/base/words.hpp"

namespace host {
namespace {

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

bool has_control(std::string_view text) {
  return std::any_of(text.begin(), text.end(),
                     [](char c) { return static_cast<unsigned char>(c) < ' ' || c == '\x7f'; });
}

ConfigLine malformed(std::string_view bytes, const char* problem) {
  ConfigLine line{.kind = LineKind::malformed, .bytes = bytes, .problem = problem};
  line.looks_like_a_header = trimmed(bytes).starts_with('[');
  return line;
}

ConfigLine parse_header(std::string_view bytes, std::string_view content) {
  if (content.size() < 2 || content.back() != ']') {
    return malformed(bytes, "a section header is [name] and nothing behind it");
  }
  const std::string_view name = trimmed(content.substr(1, content.size() - 2));
  if (name.empty() || name.find_first_of("[]") != std::string_view::npos || has_control(name)) {
    return malformed(bytes, "a section name is not empty and has no bracket or control character");
  }
  return {.kind = LineKind::header, .bytes = bytes, .name = name};
}

// Whether the lines of a section are all in order; logs the first that isn't.
bool check_section(const std::vector<ConfigLine>& lines, const char* file,
                   const SectionRange& range) {
  std::unordered_set<std::string_view> keys;
  for (std::size_t i = range.header + 1; i < range.end; ++i) {
    const char* problem = lines[i].problem;
    if (lines[i].kind == LineKind::entry && !keys.insert(lines[i].name).second) {
      problem = kRepeatedKey;
    }
    if (problem != nullptr) {
      log_malformed(file, i, problem);
      return false;
    }
  }
  return true;
}

}  // namespace

ConfigLine parse_line(std::string_view bytes) {
  const std::string_view content = trimmed(bytes);  // line ends are blanks, too
  if (content.find('\0') != std::string_view::npos) {
    return malformed(bytes, "it holds a zero byte");
  }
  if (content.empty() || content.front() == '#' || content.front() == ';') {
    return {.kind = LineKind::ignored, .bytes = bytes};
  }
  if (content.front() == '[') {
    return parse_header(bytes, content);
  }
  const std::size_t equals = content.find('=');
  if (equals == std::string_view::npos) {
    return malformed(bytes, "it is no [section], key = value or # comment");
  }
  const std::string_view key = trimmed(content.substr(0, equals));
  if (key.empty() || has_control(key)) {
    return malformed(bytes, "a key is not empty and has no control character");
  }
  return {.kind = LineKind::entry,
          .bytes = bytes,
          .name = key,
          .value = trimmed(content.substr(equals + 1))};
}

std::vector<ConfigLine> parse_lines(std::string_view text) {
  std::vector<ConfigLine> lines;
  // The mark belongs to the first line's bytes, so that rewriting keeps it.
  const std::size_t mark = text.starts_with(kByteOrderMark) ? kByteOrderMark.size() : 0;
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t line_end = std::min(text.find('\n', start), text.size() - 1) + 1;
    const std::size_t skipped = start == 0 ? mark : 0;
    ConfigLine line = parse_line(text.substr(start + skipped, line_end - start - skipped));
    line.bytes = text.substr(start, line_end - start);
    lines.push_back(line);
    start = line_end;
  }
  return lines;
}

void log_malformed(const char* file, std::size_t index, const char* problem) {
  log_line("%s:%zu: malformed line: %s; correct the line", file, index + 1, problem);
}

FindResult find_section(const std::vector<ConfigLine>& lines, const char* file,
                        std::string_view section, SectionRange& range) {
  bool found = false;
  bool inside = false;
  const ConfigLine* broken_header = nullptr;
  range.end = lines.size();
  for (std::size_t i = 0; i < lines.size(); ++i) {
    if (lines[i].looks_like_a_header && broken_header == nullptr) {
      broken_header = &lines[i];
    }
    if (lines[i].kind != LineKind::header) {
      continue;
    }
    if (inside) {
      range.end = i;
    }
    inside = lines[i].name == section;
    if (inside && found) {
      log_malformed(file, i, kRepeatedSection);
      return FindResult::malformed;
    }
    if (inside) {
      found = true;
      range.header = i;
    }
  }
  if (found) {
    return check_section(lines, file, range) ? FindResult::found : FindResult::malformed;
  }
  if (broken_header != nullptr) {  // most likely the one that was asked for
    log_malformed(file, static_cast<std::size_t>(broken_header - lines.data()),
                  broken_header->problem);
  }
  return FindResult::missing;
}

}  // namespace host
