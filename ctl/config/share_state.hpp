// What is wrong with a share, as runs would find it.
#ifndef VORN_CTL_SHARE_STATE_HPP
#define VORN_CTL_SHARE_STATE_HPP

#include <string>
#include <vector>

#include "base/configuration.hpp"

namespace ctl {

struct ShareState {
  std::string kind;  // of its file system: "ext4"; empty when that can't be told
  std::string
      problem;  // what is wrong and what to do ("...; ..."); empty when runs count its files
  std::vector<admin::Place> places;  // where its files are; none when there is a problem
};

// Waits ten seconds for a folder that doesn't answer.
ShareState state_of(const Share& share);

// The shares with their states, by name.
using ShareStates = std::vector<std::pair<std::string, ShareState>>;
ShareStates states_of(const std::vector<Share>& shares);
// Those of `others` that hold files of the share `name`, whose state is `own`.
std::vector<std::string> overlapping(const std::string& name, const ShareState& own,
                                     const ShareStates& others);
// What is said of two of them.
std::string overlap_warning(const std::string& one, const std::string& other);

}  // namespace ctl

#endif
