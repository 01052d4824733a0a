// The shares of share.conf.
#ifndef VORN_HOST_SHARES_HPP
#define VORN_HOST_SHARES_HPP

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace host {

struct Share {
  std::string name;
  std::string path;        // empty when it can't be worked with
  std::string path_error;  // then, what is wrong with it and what to do
  std::string file_index;  // empty when the share keeps none
  bool network = false;    // walk it on a network file system too
};

// Why `name` can't be the name of a share ("it holds a comma"), or null.
const char* share_name_error(std::string_view name);

// Why `path` can't be the folder of a share, and what to do, or null.
const char* share_path_error(std::string_view path);

// The shares of `file` in its order. One log line for each that is left out (a bad name, a
// malformed section), whose names go to `left_out`. Nothing when the file can't be read (logged).
std::optional<std::vector<Share>> load_shares(const char* file,
                                              std::vector<std::string>* left_out = nullptr);

// Whether `path` lies in the share that is being walked (the one whose folder was asked for last),
// and that share is walked on network file systems too.
bool is_in_network_share(std::string_view path);

// The server's shares, read the first time somebody asks; null when that failed.
const std::vector<Share>* all_shares();
// The same, read anew; what was handed out before is gone.
const std::vector<Share>* read_shares();
// The names of those that were left out.
const std::vector<std::string>& shares_left_out();
// The one called `name`; null when there is none, or `name` is null.
const Share* find_share(const char* name);

}  // namespace host

#endif
