// The shares, and whether runs can read them.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace admin {

struct Share {
  std::string name;
  std::string path;        // empty when runs can't work with it
  std::string path_error;  // then, what is wrong with it and what to do
  std::string file_index;  // empty when the share keeps none
  bool network = false;    // walked on a network file system too
};

// The shares in the order of their file; a message for each that is left out. Nothing, after a
// message, when the file can't be read.
std::optional<std::vector<Share>> read_shares();

// Why `name` can't be the name of a share ("it holds a comma"); empty when it can.
std::string share_name_problem(std::string_view name);
// Why `path` can't be the folder of a share, and what to do; empty when it can, whatever is there.
std::string share_path_problem(std::string_view path);

struct FileSystem {
  std::string type;        // by the mount table: "ext4", "nfs4"
  bool is_walked = false;  // runs count its files
  bool is_remote = false;  // another server's: walked for a share with `network` only
};
// The file system that holds `path`, links followed; nothing when that can't be told. A dead
// network server keeps this waiting for ever.
std::optional<FileSystem> file_system_of(const std::string& path);

// The places of one folder: the parts of file systems that lie in it, links followed and mounts
// counted, so that two ways to the same files are seen to be that. Empty when it can't be found. A
// dead network server keeps this waiting for ever.
struct Place {
  unsigned long long device = 0;
  std::string path;  // within the file system of that device
};
std::vector<Place> places_of(const std::string& path);
// Whether two folders hold some of the same files.
bool overlap(const std::vector<Place>& one, const std::vector<Place>& other);

}  // namespace admin
