// What a name or value must be to do its work, asked before anything is written.
#ifndef VORN_CTL_CHECKS_HPP
#define VORN_CTL_CHECKS_HPP

#include <nlohmann/json_fwd.hpp>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace ctl {

// Each returns what is wrong and what to do, as the end of a sentence, or an empty text.

// A text that a configuration line holds and gives back: UTF-8, no control characters, no blanks
// around it.
std::string text_problem(std::string_view text);
std::string share_name_problem(std::string_view name);
// An absolute path of a folder that is there.
std::string share_path_problem(const std::string& path);

// A key of a profile.
struct ProfileKey {
  const char* name;
  const char* option;  // of `profile add` and `profile set`, with its old spelling; null: none
  const char* type;    // how the option's value is shown, and what completes it
  const char* help;
  bool is_list;  // words separated by commas
  std::string (*problem)(const std::string& value);
};
std::span<const ProfileKey> profile_keys();
// By its name or as its option spells it. Throws a Failure, with the nearest one, for a name that
// is no key of a profile.
const ProfileKey& profile_key(const std::string& name);
// `value` as it shall stand in the file: the words of a list with a plain comma between them.
// Throws a Failure when it can't do its work.
std::string checked_value(const ProfileKey& key, const std::string& value);
// The value that stands in the file for the key `name` as JSON has it: a list, number or boolean;
// a text for a key that is none of a profile.
nlohmann::ordered_json json_value(const std::string& name, const std::string& value);

std::vector<std::string> report_names();
// The codes of the languages that are installed.
std::vector<std::string> installed_languages();

// Whether a volume has quotas of users.
bool any_quotas();

// `; did you mean "..."?` for the nearest of `names`, or nothing when none is near.
std::string suggestion(std::string_view name, const std::vector<std::string>& names);

}  // namespace ctl

#endif
