// vornctl share: the shares that reports cover.
#include <sys/stat.h>

#include <algorithm>
#include <iterator>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "config/checks.hpp"
#include "config/commands.hpp"
#include "config/samba.hpp"
#include "config/share_state.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

// --- add ----------------------------------------------------------------------------------------

std::string titled(const std::string& name) {
  return "share \"" + name + "\"";
}

// `path` as it shall stand in the file.
std::string checked_path(const std::string& share, std::string path) {
  while (path.size() > 1 && path.ends_with('/')) {
    path.pop_back();
  }
  if (const std::string problem = share_path_problem(path); !problem.empty()) {
    throw Failure(titled(share) + ": " + problem);
  }
  return path;
}

std::string checked_file_index(const std::string& share, const std::string& path) {
  struct stat status {};
  std::string problem = text_problem(path);
  if (problem.empty() && !path.starts_with('/')) {
    problem = "is not absolute";
  }
  if (problem.empty() && (lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode))) {
    problem = "is no file, or a link, which no run follows";
  }
  if (!problem.empty()) {
    throw Failure(titled(share) + ": --file-index " + path + " " + problem +
                  "; give the path of the share's database");
  }
  return path;
}

std::string checked_network(const std::string& word) {
  if (word != "yes" && word != "no") {
    throw Failure("network \"" + word + "\" is neither yes nor no");
  }
  return word;
}

void check_name(const std::string& name) {
  if (const std::string problem = share_name_problem(name); !problem.empty()) {
    throw Failure(titled(name) + ": " + problem);
  }
}

// Says what a run would do without, and what it would count twice.
void warn_of_state(const Share& share, const std::vector<Share>& others) {
  const ShareState own = state_of(share);
  if (!own.problem.empty()) {
    warn(titled(share.name) + ": " + own.problem);
  }
  for (const std::string& other : overlapping(share.name, own, states_of(others))) {
    warn(overlap_warning(other, share.name));
  }
}

struct NewShare {
  std::string name;
  std::string path;
  std::string file_index;
  bool network = false;
};

void add_share(NewShare share) {
  check_name(share.name);
  share.path = checked_path(share.name, share.path);
  Changes entries{{"path", share.path}};
  if (!share.file_index.empty()) {
    entries.emplace_back("file_index", checked_file_index(share.name, share.file_index));
  }
  if (share.network) {
    entries.emplace_back("network", "yes");
  }
  const std::vector<Share> others = read_shares();
  add_section(VORN_PATH_SHARES, share.name, entries);
  warn_of_state({share.name, share.path, {}, share.file_index, share.network}, others);
}

constexpr const char* kIndexHelp = "Database that lists the files, not to walk";
constexpr const char* kNetworkHelp = "Walk the folder though it is on another server";

void describe_add(CLI::App& group) {
  CLI::App& add = *group.add_subcommand("add", "Let reports cover a folder");
  const auto share = std::make_shared<NewShare>();
  add.add_option("NAME", share->name, "Name of the share in reports")->type_name("")->required();
  add.add_option("FOLDER", share->path, "Its absolute path")->type_name("")->required();
  add.add_option("--file-index", share->file_index, kIndexHelp)->type_name("FILE");
  add.add_flag("--network", share->network, kNetworkHelp);
  add.callback([share] { add_share(std::move(*share)); });
}

// --- set ----------------------------------------------------------------------------------------

struct ShareChanges {
  std::string name;
  std::string new_name;
  std::string path;
  std::optional<std::string> file_index;
  std::optional<bool> network;
};

// One key; an empty value unsets it.
std::pair<std::string, std::optional<std::string>> checked_key(const Section& section,
                                                               const std::string& key,
                                                               const std::string& value) {
  if (key == "path") {
    return {key, checked_path(section.name, value)};
  }
  const std::string name = key == "file-index" ? "file_index" : key;
  if (name != "file_index" && name != "network" && (!value.empty() || !section.find(name))) {
    throw Failure("\"" + key + "\" is no key of a share; there are path, file_index and network");
  }
  if (value.empty()) {
    return {name, std::nullopt};
  }
  return {name,
          name == "network" ? checked_network(value) : checked_file_index(section.name, value)};
}

// Lets every profile that names the share call it by its new name.
void follow(const std::string& name, const std::string& new_name) {
  for (const Section& profile : read_profiles()) {
    const std::string list = profile.value("share_list");
    std::string followed;
    bool names_it = false;
    for (const std::string_view word : host::comma_words(list)) {
      names_it = names_it || word == name;
      followed.append(followed.empty() ? "" : ",").append(word == name ? new_name : word);
    }
    if (names_it) {
      change_section(VORN_PATH_CONFIG, profile.name, {{"share_list", followed}});
      print_line("profile " + profile.name + " now covers " + new_name);
    }
  }
}

using Pairs = std::vector<std::pair<std::string, std::string>>;

void set_share(const ShareChanges& set, Pairs pairs) {
  std::optional<Section> section = admin::read_section(VORN_PATH_SHARES, set.name);
  if (!section) {
    throw host_failure(titled(set.name) + " is not in " VORN_PATH_SHARES
                                          "; see vornctl share list");
  }
  if (!set.path.empty()) {
    pairs.emplace_back("path", set.path);
  }
  if (set.file_index) {
    pairs.emplace_back("file_index", *set.file_index);
  }
  if (set.network) {
    pairs.emplace_back("network", *set.network ? "yes" : "");
  }
  Changes changes;
  for (const auto& [key, value] : pairs) {
    changes.push_back(checked_key(*section, key, value));
  }
  const bool is_renamed = !set.new_name.empty() && set.new_name != set.name;
  if (changes.empty() && !is_renamed) {
    throw Failure("say what to change: --path, --file-index, --network or --name", kWrongUsage);
  }
  if (is_renamed) {
    check_name(set.new_name);
  }
  change_section(VORN_PATH_SHARES, set.name, changes, is_renamed ? set.new_name : "");
  if (is_renamed) {
    follow(set.name, set.new_name);
  }
  std::vector<Share> others = read_shares();
  const std::string& name = is_renamed ? set.new_name : set.name;
  const auto own = std::find_if(others.begin(), others.end(),
                                [&](const Share& share) { return share.name == name; });
  if (own != others.end() && !changes.empty()) {
    warn_of_state(Share(*own), others);
  }
}

void describe_set(CLI::App& group) {
  CLI::App* set = group.add_subcommand("set", "Change a share; an empty value unsets a key");
  const auto share = std::make_shared<ShareChanges>();
  add_share_argument(*set, share->name);
  add_pairs(*set);
  set->add_option("--name", share->new_name, "New name, in the profiles that name it as well")
      ->type_name("NAME");
  set->add_option("--path", share->path, "New folder")->type_name("FOLDER");
  set->add_option("--file-index", share->file_index, kIndexHelp)->type_name("FILE");
  const auto network = std::make_shared<bool>();
  const auto no_network = std::make_shared<bool>();
  set->add_flag("--network", *network, kNetworkHelp);
  set->add_flag("--no-network", *no_network, "Leave it out when it is")->excludes("--network");
  set->callback([set, share, network, no_network] {
    if (*network || *no_network) {
      share->network = *network;
    }
    set_share(*share, pairs_of(*set));
  });
}

// --- list ---------------------------------------------------------------------------------------

std::string joined(const std::vector<std::string>& names) {
  std::string all;
  for (const std::string& name : names) {
    all += (all.empty() ? "" : ", ") + name;
  }
  return all;
}

nlohmann::ordered_json text_or_null(const std::string& text) {
  return text.empty() ? nlohmann::ordered_json(nullptr) : nlohmann::ordered_json(text);
}

void list_shares(bool json) {
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  Table table({{"SHARE"}, {"FOLDER"}, {"KIND"}, {"NETWORK"}, {"FILE INDEX"}, {"STATE"}});
  const std::vector<Share> shares = read_shares();
  const ShareStates states = states_of(shares);
  for (std::size_t i = 0; i < shares.size(); ++i) {
    const Share& share = shares[i];
    const ShareState& state = states[i].second;
    const std::vector<std::string> overlaps = overlapping(share.name, state, states);
    const std::string overlap = overlaps.empty() ? "" : "holds files of " + joined(overlaps);
    const std::string said = !state.problem.empty() ? state.problem
                             : !overlap.empty()     ? overlap
                                                    : "fine";
    list.push_back({{"name", share.name},
                    {"path", text_or_null(share.path)},
                    {"kind", text_or_null(state.kind)},
                    {"network", share.network},
                    {"file_index", text_or_null(share.file_index)},
                    {"state", said},
                    {"walked", state.problem.empty()},
                    {"overlaps", overlaps}});
    table.add({share.name, share.path, state.kind.empty() ? "-" : state.kind,
               share.network ? "yes" : "no", share.file_index.empty() ? "-" : share.file_index,
               said});
  }
  if (json) {
    print_json(list);
  } else if (table.empty()) {
    warn("there are no shares; add one with vornctl share add NAME FOLDER");
  } else {
    table.print();
  }
}

void describe_list(CLI::App& group) {
  CLI::App& list = *group.add_subcommand("list", "Print every share");
  const auto json = std::make_shared<bool>();
  add_json_flag(list, *json);
  list.callback([json] { list_shares(*json); });
}

// --- remove -------------------------------------------------------------------------------------

// The names of the profiles that select the share, with commas between them.
std::string profiles_with(const std::string& share) {
  std::string names;
  for (const Section& profile : read_profiles()) {
    const std::string list = profile.value("share_list");
    const auto words = host::comma_words(list);
    if (std::find(words.begin(), words.end(), share) != words.end()) {
      names += (names.empty() ? "" : ", ") + profile.name;
    }
  }
  return names;
}

void remove_share(const std::string& name, bool force) {
  const std::string profiles = profiles_with(name);
  if (!profiles.empty() && !force) {
    throw Failure(titled(name) + " is named by the share_list of " + profiles +
                  "; change it with vornctl profile set, or give --force");
  }
  remove_section(VORN_PATH_SHARES, name);
  if (!profiles.empty()) {
    warn("the share_list of " + profiles + " still names the share; reports leave it out");
  }
}

void describe_remove(CLI::App& group) {
  CLI::App& remove = *group.add_subcommand("remove", "Let reports cover a share no longer");
  const auto name = std::make_shared<std::string>();
  const auto force = std::make_shared<bool>();
  add_share_argument(remove, *name);
  remove.add_flag("--force", *force, "Also when a profile names the share");
  remove.callback([name, force] { remove_share(*name, *force); });
}

// --- import-samba -------------------------------------------------------------------------------

// Samba's names don't depend on case.
std::string folded(std::string name) {
  std::transform(name.begin(), name.end(), name.begin(),
                 [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c | 0x20) : c; });
  return name;
}

std::string import_problem(const SambaShare& share, const std::vector<std::string>& known) {
  if (!share.skipped.empty()) {
    return share.skipped;
  }
  if (std::find(known.begin(), known.end(), folded(share.name)) != known.end()) {
    return "there is a share of this name already";
  }
  const std::string problem = share_name_problem(share.name);
  return problem.empty() ? share_path_problem(share.path) : problem;
}

struct Import {
  bool dry_run = false;
  bool with_user_shares = false;
  bool json = false;
};

// What became of one of Samba's shares, as a line or for the list.
void tell(const Import& import, nlohmann::ordered_json& list, const SambaShare& share,
          const char* outcome, const std::string& reason) {
  if (import.json) {
    list.push_back({{"name", share.name},
                    {"path", text_or_null(share.path)},
                    {"outcome", outcome},
                    {"reason", text_or_null(reason)}});
  } else if (!reason.empty()) {
    print_line(std::string(outcome) + " " + share.name + ": " + reason);
  } else {
    print_line(std::string(outcome) + " " + share.name + ": " + share.path);
  }
}

void import_share(const Import& import, const SambaShare& share, ShareStates& states) {
  if (!import.dry_run) {
    add_section(VORN_PATH_SHARES, share.name, {{"path", share.path}});
  }
  ShareState state = state_of({share.name, share.path, {}, {}, false});
  if (!state.problem.empty()) {
    warn(titled(share.name) + ": " + state.problem);
  }
  for (const std::string& other : overlapping(share.name, state, states)) {
    warn(overlap_warning(other, share.name));
  }
  states.emplace_back(share.name, std::move(state));
}

void import_samba(const Import& import) {
  std::vector<std::string> known;
  std::size_t left_out = 0;
  const std::vector<Share> shares = read_shares();
  std::transform(shares.begin(), shares.end(), std::back_inserter(known),
                 [](const Share& share) { return folded(share.name); });
  ShareStates states = states_of(shares);
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  for (const SambaShare& share : samba_shares()) {
    const std::string problem = import_problem(share, known);
    if (share.of_user && !import.with_user_shares) {
      left_out += problem.empty() ? 1 : 0;
      if (import.json) {
        tell(import, list, share, "left out", "a user has made it, who can lead it anywhere");
      }
    } else if (!problem.empty()) {
      tell(import, list, share, "skipped", problem);
    } else {
      import_share(import, share, states);
      tell(import, list, share, import.dry_run ? "would import" : "imported", "");
      known.push_back(folded(share.name));
    }
  }
  if (import.json) {
    print_json(list);
  } else if (left_out > 0) {
    print_line(
        "left out " + std::to_string(left_out) +
        " that users have made, who can lead them anywhere; --usershares takes these as well");
  }
}

void describe_import(CLI::App& group) {
  CLI::App& command = *group.add_subcommand("import-samba", "Add the shares that Samba offers");
  const auto import = std::make_shared<Import>();
  command.add_flag("--dry-run", import->dry_run, "Only print what would be added");
  command.add_flag("--usershares", import->with_user_shares,
                   "Also the shares that users have made");
  add_json_flag(command, import->json);
  command.callback([import] { import_samba(*import); });
}

}  // namespace

void add_share_commands(CLI::App& app) {
  CLI::App& group = *app.add_subcommand("share", "The shares that reports cover");
  group.require_subcommand(1);
  describe_add(group);
  describe_set(group);
  describe_list(group);
  describe_remove(group);
  describe_import(group);
}

}  // namespace ctl
