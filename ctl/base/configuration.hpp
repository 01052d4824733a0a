// The configuration files as vornctl reads and changes them. Every failure is thrown as a Failure.
#ifndef VORN_CTL_CONFIGURATION_HPP
#define VORN_CTL_CONFIGURATION_HPP

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "config/shares.hpp"

namespace ctl {

// A section of a configuration file with its keys in the order of the file.
struct Section {
  std::string name;
  std::vector<std::pair<std::string, std::string>> entries;

  // The value of `key`, or null.
  const std::string* find(std::string_view key) const;
  // The value of `key`, or `otherwise` when it is missing or empty.
  std::string value(std::string_view key, std::string_view otherwise = "") const;
};

// Whether `name` can name a profile; says why not. "global" is no profile.
void check_profile_name(const std::string& name);

// Every profile but "global", in the order of the file. A malformed section is warned of and left
// out.
std::vector<Section> read_profiles();
// One profile; "global" counts here.
Section read_profile(const std::string& name);
bool profile_exists(const std::string& name);

// The usable shares in the order of the file; what is left out is warned of.
std::vector<host::Share> read_shares();

// --- Changing -----------------------------------------------------------------------------------

// Keys with their new values; no value removes the key.
using Changes = std::vector<std::pair<std::string, std::optional<std::string>>>;

// Each changes one section of `file` and keeps every other byte; the file is replaced atomically,
// with its owner and mode, under a lock, and only by a text that reads back as meant.
void add_section(const char* file, const std::string& name, const Changes& entries);
void change_section(const char* file, const std::string& name, const Changes& changes);
void remove_section(const char* file, const std::string& name);

}  // namespace ctl

#endif
