// The configuration files, as an administrator reads and changes them.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace admin {

// A section of a configuration file with its keys in the order of the file.
struct Section {
  std::string name;
  std::vector<std::pair<std::string, std::string>> entries;

  // The value of `key`, or null.
  const std::string* find(std::string_view key) const;
  // The value of `key`, or `otherwise` when it is missing or empty.
  std::string value(std::string_view key, std::string_view otherwise = "") const;
};

// --- Reading ------------------------------------------------------------------------------------

// Whether `name` can name a profile; a message says why not, the first time for each name. "global"
// can by its letters, but stands for the whole server.
bool is_profile_name(const std::string& name);

// Every profile that runs can work with, in the order of the file, without "global"; a message for
// each other one. Nothing, after a message, when the file can't be read.
std::optional<std::vector<Section>> read_profiles();

// The section of `file` as runs read it. Nothing when it isn't there (without a message), when it
// has a line that can't be understood, or when the file can't be read.
std::optional<Section> read_section(const std::string& file, const std::string& name);

// A line that can't be understood; a run does without the whole section that it stands in.
struct WrongLine {
  std::size_t number = 0;  // from 1 on
  std::string problem;
};

struct ConfigFile {
  std::vector<Section> sections;  // every one, with the entries that can be understood
  std::vector<WrongLine> wrong;
};
// All that `file` says, right or wrong. Nothing, after a message, when it can't be read.
std::optional<ConfigFile> examine_file(const std::string& file);

// --- Changing -----------------------------------------------------------------------------------

// Keys with their new values; no value removes the key. Of two for one key the last counts.
using Changes = std::vector<std::pair<std::string, std::optional<std::string>>>;

// Each changes one section of `file` and keeps every other byte; the file is replaced atomically,
// with its owner and mode, under a lock, and only by a text that reads back as meant. False, after
// a message and with nothing changed: the section is there already (add) or isn't (change, remove),
// it can't be understood, a name or value doesn't fit a line, or the file can't be replaced.
bool add_section(const std::string& file, const std::string& name, const Changes& entries);
// A `new_name` renames the section, in the same step; one of that name must not be there.
bool change_section(const std::string& file, const std::string& name, const Changes& changes,
                    const std::string& new_name = {});
bool remove_section(const std::string& file, const std::string& name);

}  // namespace admin
