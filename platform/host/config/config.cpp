// Sectioned configuration files: reading, listing and rewriting.
#include "vorn/config.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <exception>

#include "base/host_log.hpp"
#include "base/text_containers.hpp"
#include "config/config_file.hpp"
#include "config/config_lines.hpp"
#include "vorn/base/file_io.hpp"

namespace host {
namespace {

using Entries = std::vector<VLIBCSzHash::Entry>;

constexpr std::size_t kLargestFile = 16U << 20U;

int fail(int code, int line) {
  VLIBCErrSetEx(code, "platform/host/config/config.cpp", line);
  return -1;
}

int find_failure(FindResult result, int line) {
  errno = result == FindResult::malformed ? EINVAL : errno;
  return fail(result == FindResult::missing ? VLIBC_ERR_NO_SECTION : VLIBC_ERR_MALFORMED_FILE,
              line);
}

int get_section(const char* file, std::string_view section, VLIBCSzHash& hash) {
  const std::optional<std::string> text = read_config(file);
  if (!text) {
    return fail(VLIBC_ERR_FILE_IO, __LINE__);
  }
  const std::vector<ConfigLine> lines = parse_lines(*text);
  SectionRange range;
  const FindResult result = find_section(lines, file, section, range);
  if (result != FindResult::found) {
    return find_failure(result, __LINE__);
  }
  hash.origin = {file, std::string(section), {}};
  for (std::size_t i = range.header + 1; i < range.end; ++i) {
    if (lines[i].kind == LineKind::entry) {
      hash.set(lines[i].name, lines[i].value);
      hash.origin->entries.emplace(lines[i].name, lines[i].value);
    }
  }
  return static_cast<int>(hash.origin->entries.size());
}

// --- Rewriting ----------------------------------------------------------------------------------

// `format` with key and value in its two "%s". Not printf: the format comes from outside.
std::string formatted(std::string_view format, const VLIBCSzHash::Entry& entry) {
  std::string line;
  const std::size_t first = format.find("%s");
  const std::size_t second = format.find("%s", first + 2);
  line.append(format.substr(0, first)).append(entry.first);
  line.append(format.substr(first + 2, second - first - 2)).append(entry.second);
  return line.append(format.substr(second + 2));
}

bool valid_format(std::string_view format) {
  const std::size_t first = format.find("%s");
  return first != std::string_view::npos &&
         format.find("%s", first + 2) != std::string_view::npos &&
         std::count(format.begin(), format.end(), '%') == 2 && format.ends_with('\n');
}

// Every line that would be written must read back as the entry that it stands for; this refuses
// line ends, blanks at the ends and keys that look like headers or comments, all in one.
bool entries_fit(const char* file, std::string_view format, const Entries& entries) {
  for (const VLIBCSzHash::Entry& entry : entries) {
    const std::string bytes = formatted(format, entry);
    const ConfigLine line = parse_line(bytes);
    if (line.kind != LineKind::entry || line.name != entry.first || line.value != entry.second ||
        std::count(bytes.begin(), bytes.end(), '\n') != 1) {
      log_line("%s: key \"%.*s\" not written: key or value doesn't fit a configuration line", file,
               static_cast<int>(std::min<std::size_t>(entry.first.size(), 100)),
               entry.first.data());
      return false;
    }
  }
  return true;
}

std::string rewritten(const std::vector<ConfigLine>& lines, const SectionRange& range,
                      std::string_view format, Entries entries) {
  std::size_t last_key = range.header;
  for (std::size_t i = range.header + 1; i < range.end; ++i) {
    last_key = lines[i].kind == LineKind::entry ? i : last_key;
  }
  std::string text;
  for (std::size_t i = 0; i < lines.size(); ++i) {
    const ConfigLine& line = lines[i];
    if (i > range.header && i < range.end && line.kind == LineKind::entry) {
      const auto entry = std::find_if(entries.begin(), entries.end(),
                                      [&](const auto& e) { return e.first == line.name; });
      if (entry != entries.end()) {
        text += formatted(format, *entry);
        entries.erase(entry);
      }
    } else {
      text += line.bytes;
    }
    if (i == last_key) {
      if (!entries.empty() && !text.ends_with('\n')) {
        text += '\n';
      }
      // Keys below this line are none, so what is left of the entries is new.
      for (const VLIBCSzHash::Entry& entry : entries) {
        text += formatted(format, entry);
      }
    }
  }
  return text;
}

// The entries that `hash` means, now that the section holds `lines`: of a section that it was read
// from what it has changed since, and all the rest as the section has it. Somebody else may have
// changed that in between. The views are those of `hash` and `lines`.
Entries meant_entries(const VLIBCSzHash& hash, const std::vector<ConfigLine>& lines,
                      const SectionRange& range, const char* file, std::string_view section) {
  Entries wanted = hash.sorted();
  if (!hash.origin || hash.origin->file != file || hash.origin->section != section) {
    return wanted;
  }
  const auto& before = hash.origin->entries;
  Entries meant;
  for (std::size_t i = range.header + 1; i < range.end; ++i) {
    if (lines[i].kind != LineKind::entry) {
      continue;
    }
    const char* value = hash.find(lines[i].name);
    const auto known = before.find(lines[i].name);
    const bool is_removed = value == nullptr && known != before.end();
    const bool is_changed = value != nullptr && (known == before.end() || known->second != value);
    if (!is_removed) {
      meant.emplace_back(lines[i].name, is_changed ? std::string_view(value) : lines[i].value);
    }
  }
  for (const VLIBCSzHash::Entry& entry : wanted) {
    const auto known = before.find(entry.first);
    const bool is_there = std::any_of(meant.begin(), meant.end(),
                                      [&](const auto& e) { return e.first == entry.first; });
    if (!is_there && (known == before.end() || known->second != entry.second)) {
      meant.push_back(entry);
    }
  }
  return meant;
}

int set_section(const char* file, std::string_view section, const VLIBCSzHash& hash,
                std::string_view format) {
  if (!valid_format(format)) {
    log_line("%s: not rewritten: the line format needs %%s twice and a line end", file);
    return fail(VLIBC_ERR_BAD_PARAMETER, __LINE__);
  }
  if (!entries_fit(file, format, hash.sorted())) {
    return fail(VLIBC_ERR_BAD_PARAMETER, __LINE__);
  }
  return rewrite_config(file, [&](std::string_view text) -> std::optional<std::string> {
    const std::vector<ConfigLine> lines = parse_lines(text);
    SectionRange range;
    const FindResult result = find_section(lines, file, section, range);
    if (result == FindResult::missing) {
      log_line("%s: section [%.*s] is missing, so it can't be rewritten", file,
               static_cast<int>(std::min<std::size_t>(section.size(), 100)), section.data());
    }
    if (result != FindResult::found) {
      find_failure(result, __LINE__);
      return std::nullopt;
    }
    return rewritten(lines, range, format, meant_entries(hash, lines, range, file, section));
  });
}

}  // namespace

std::optional<std::string> read_config(const char* file) {
  std::optional<std::string> text = read_file(file, kLargestFile);
  if (!text) {
    log_line("%s can't be read (%s); make it a regular file that this program may read", file,
             std::strerror(errno));
  }
  return text;
}

bool config_is_readable(const char* file) {
  return read_config(file).has_value();
}

}  // namespace host

int VLIBCFileGetSection(const char* file, const char* section, VLIBCSzHash** hash) {
  if (file == nullptr || section == nullptr || hash == nullptr || *hash == nullptr) {
    return host::fail(VLIBC_ERR_BAD_PARAMETER, __LINE__);
  }
  try {
    return host::get_section(file, section, **hash);
  } catch (const std::exception&) {
    return host::fail(VLIBC_ERR_FILE_IO, __LINE__);
  }
}

int VLIBCFileSetSection(const char* file, const char* section, const char* new_name,
                        const VLIBCSzHash* hash, const char* line_format) {
  if (file == nullptr || section == nullptr || new_name != nullptr || hash == nullptr ||
      line_format == nullptr) {
    host::log_line("configuration not rewritten: a parameter is missing or not supported");
    return host::fail(VLIBC_ERR_BAD_PARAMETER, __LINE__);
  }
  try {
    return host::set_section(file, section, *hash, line_format);
  } catch (const std::exception&) {
    return host::fail(VLIBC_ERR_FILE_IO, __LINE__);
  }
}

int VLIBCFileEnumSection(const char* file, VLIBCSzList** list) {
  if (file == nullptr || list == nullptr || *list == nullptr) {
    return host::fail(VLIBC_ERR_BAD_PARAMETER, __LINE__);
  }
  try {
    const std::optional<std::string> text = host::read_config(file);
    if (!text) {
      return host::fail(VLIBC_ERR_FILE_IO, __LINE__);
    }
    const std::vector<host::ConfigLine> lines = host::parse_lines(*text);
    int sections = 0;
    for (std::size_t i = 0; i < lines.size(); ++i) {
      if (lines[i].kind == host::LineKind::header) {
        (*list)->texts.emplace_back(lines[i].name);
        ++sections;
      } else if (lines[i].looks_like_a_header) {
        host::log_malformed(file, i, lines[i].problem);
      }
    }
    return sections;
  } catch (const std::exception&) {
    return host::fail(VLIBC_ERR_FILE_IO, __LINE__);
  }
}
