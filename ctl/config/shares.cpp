// vornctl share: the shares that reports cover.
#include <sys/stat.h>

#include <algorithm>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "config/checks.hpp"
#include "config/commands.hpp"
#include "config/samba.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

// --- add ----------------------------------------------------------------------------------------

struct NewShare {
  std::string name;
  std::string path;
  std::string file_index;
  bool network = false;
};

std::string titled(const std::string& name) {
  return "share \"" + name + "\"";
}

void check_file_index(const NewShare& share) {
  struct stat status {};
  std::string problem = text_problem(share.file_index);
  if (problem.empty() && !share.file_index.starts_with('/')) {
    problem = "is not absolute";
  }
  if (problem.empty() &&
      (lstat(share.file_index.c_str(), &status) != 0 || !S_ISREG(status.st_mode))) {
    problem = "is no file, or a link, which no run follows";
  }
  if (!problem.empty()) {
    throw Failure(titled(share.name) + ": --file-index " + share.file_index + " " + problem +
                  "; give the path of the share's database");
  }
}

bool is_remote(const std::string& path) {
  const auto found = admin::file_system_of(path);
  return found && found->is_remote;
}

void add_share(NewShare share) {
  while (share.path.size() > 1 && share.path.ends_with('/')) {
    share.path.pop_back();
  }
  for (const std::string& problem :
       {share_name_problem(share.name), share_path_problem(share.path)}) {
    if (!problem.empty()) {
      throw Failure(titled(share.name) + ": " + problem);
    }
  }
  if (!share.file_index.empty()) {
    check_file_index(share);
  }
  for (const Share& other : read_shares()) {
    if (other.path == share.path && other.name != share.name) {
      warn(titled(other.name) + " covers " + share.path + " as well; its files will count twice");
    }
  }
  if (!share.network && is_remote(share.path)) {
    warn(share.path + " is on another server, so reports leave it out without --network");
  }
  Changes entries{{"path", share.path}};
  if (!share.file_index.empty()) {
    entries.emplace_back("file_index", share.file_index);
  }
  if (share.network) {
    entries.emplace_back("network", "yes");
  }
  add_section(VORN_PATH_SHARES, share.name, entries);
}

void describe_add(CLI::App& group) {
  CLI::App& add = *group.add_subcommand("add", "Let reports cover a folder");
  const auto share = std::make_shared<NewShare>();
  add.add_option("NAME", share->name, "Name of the share in reports")->type_name("")->required();
  add.add_option("FOLDER", share->path, "Its absolute path")->type_name("")->required();
  add.add_option("--file-index", share->file_index, "Database that lists the files, not to walk")
      ->type_name("FILE");
  add.add_flag("--network", share->network, "Walk the folder though it is on another server");
  add.callback([share] { add_share(std::move(*share)); });
}

// --- list ---------------------------------------------------------------------------------------

std::string state_of(const Share& share) {
  if (!share.path_error.empty()) {
    return share.path_error;
  }
  const std::string problem = share_path_problem(share.path);
  return problem.empty() ? "fine" : problem;
}

void list_shares(bool json) {
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  Table table({{"SHARE"}, {"FOLDER"}, {"FILE INDEX"}, {"STATE"}});
  for (const Share& share : read_shares()) {
    const std::string state = state_of(share);
    list.push_back({{"name", share.name},
                    {"path", share.path},
                    {"file_index", share.file_index},
                    {"state", state}});
    table.add({share.name, share.path, share.file_index.empty() ? "-" : share.file_index, state});
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
  remove.add_option("SHARE", *name, "Name of the share")->type_name("")->required();
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

void import_share(const SambaShare& share, bool dry_run) {
  if (!dry_run) {
    add_section(VORN_PATH_SHARES, share.name, {{"path", share.path}});
  }
  print_line((dry_run ? "would import " : "imported ") + share.name + ": " + share.path +
             (is_remote(share.path) ? " (on another server: left out of reports until its section "
                                      "has network = yes)"
                                    : ""));
}

void import_samba(bool dry_run, bool with_user_shares) {
  std::vector<std::string> known;
  std::size_t left_out = 0;
  for (const Share& share : read_shares()) {
    known.push_back(folded(share.name));
  }
  for (const SambaShare& share : samba_shares()) {
    const std::string problem = import_problem(share, known);
    if (share.of_user && !with_user_shares) {
      left_out += problem.empty() ? 1 : 0;
    } else if (!problem.empty()) {
      print_line("skipped " + share.name + ": " + problem);
    } else {
      import_share(share, dry_run);
      known.push_back(folded(share.name));
    }
  }
  if (left_out > 0) {
    print_line(
        "left out " + std::to_string(left_out) +
        " that users have made, who can lead them anywhere; --usershares takes these as well");
  }
}

void describe_import(CLI::App& group) {
  CLI::App& import = *group.add_subcommand("import-samba", "Add the shares that Samba offers");
  const auto dry_run = std::make_shared<bool>();
  const auto with_users = std::make_shared<bool>();
  import.add_flag("--dry-run", *dry_run, "Only print what would be done");
  import.add_flag("--usershares", *with_users, "Also the shares that users have made");
  import.callback([dry_run, with_users] { import_samba(*dry_run, *with_users);
});
}  // namespace

}  // namespace ctl

void add_share_commands(CLI::App& app) {
  CLI::App& group = *app.add_subcommand("share", "The shares that reports cover");
  group.require_subcommand(1);
  describe_add(group);
  describe_list(group);
  describe_remove(group);
  describe_import(group);
}

}  // namespace ctl
