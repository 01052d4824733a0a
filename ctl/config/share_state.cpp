#include "config/share_state.hpp"

#include <dirent.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <sstream>

#include "base/answer_within.hpp"
#include "base/ctl.hpp"

namespace ctl {
namespace {

constexpr std::chrono::seconds kFolderLimit{10};

std::string set_command(const Share& share, const std::string& what) {
  return "run vornctl share set " + shell_word(share.name) + " " + what;
}

// What is wrong with the folder of a share and what to do; empty when a run can read it.
std::string folder_problem(const Share& share) {
  const std::string& path = share.path;
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) {
    return path + " can't be found (" + std::strerror(errno) + "); mount it, or " +
           set_command(share, "--path FOLDER");
  }
  if (!S_ISDIR(status.st_mode)) {
    return path + " is no folder; " + set_command(share, "--path FOLDER");
  }
  const auto close = [](DIR* dir) { closedir(dir); };
  const std::unique_ptr<DIR, decltype(close)> dir(opendir(path.c_str()));
  if (!dir || (errno = 0, readdir(dir.get()) == nullptr && errno != 0)) {
    return path + " can't be read (" + std::strerror(errno) + "); " +
           "see to its file system, which must let root read it";
  }
  return {};
}

std::string kind_problem(const Share& share, const admin::FileSystem& found) {
  if (found.is_walked || (found.is_remote && share.network)) {
    return {};
  }
  if (found.is_remote) {
    return share.path + " is a network file system (" + found.type + "), which is left out; " +
           set_command(share, "--network");
  }
  return share.path + " is on a file system that is not walked (" + found.type + "); " +
         set_command(share, "--path FOLDER");
}

// The state as text: kind, problem, and two lines a place, no line end at the end. Paths with a
// line end are none that a share can have.
std::string asked(const Share& share) {
  std::string problem = folder_problem(share);
  std::string kind;
  std::string places;
  if (problem.empty()) {
    const auto found = admin::file_system_of(share.path);
    kind = found ? found->type : "";
    problem = found ? kind_problem(share, *found) : "";
  }
  if (problem.empty()) {
    for (const admin::Place& place : admin::places_of(share.path)) {
      places += "\n" + std::to_string(place.device) + "\n" + place.path;
    }
  }
  return kind + "\n" + problem + places;
}

}  // namespace

ShareState state_of(const Share& share) {
  if (share.path.empty()) {
    return {{}, share.path_error, {}};
  }
  const auto answer = answer_within(kFolderLimit, [&] { return asked(share); });
  if (!answer) {
    return {{}, share.path + " does not answer; see to the server that it is mounted from", {}};
  }
  ShareState state;
  std::istringstream lines(*answer);
  std::getline(lines, state.kind);
  std::getline(lines, state.problem);
  std::string device;
  admin::Place place;
  while (std::getline(lines, device) && std::getline(lines, place.path)) {
    place.device = std::stoull(device);
    state.places.push_back(place);
  }
  return state;
}

ShareStates states_of(const std::vector<Share>& shares) {
  ShareStates states;
  for (const Share& share : shares) {
    states.emplace_back(share.name, state_of(share));
  }
  return states;
}

std::vector<std::string> overlapping(const std::string& name, const ShareState& own,
                                     const ShareStates& others) {
  std::vector<std::string> names;
  for (const auto& [other, state] : others) {
    if (other != name && admin::overlap(own.places, state.places)) {
      names.push_back(other);
    }
  }
  return names;
}

std::string overlap_warning(const std::string& one, const std::string& other) {
  return "shares " + one + " and " + other +
         " hold the same files, which sums over shares count twice; let share_list of a profile "
         "name one of them";
}

}  // namespace ctl
