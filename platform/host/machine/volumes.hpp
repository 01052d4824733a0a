// Volumes: the devices of the mount table, each standing for its best mount.
#ifndef VORN_HOST_VOLUMES_HPP
#define VORN_HOST_VOLUMES_HPP

#include <sys/types.h>

#include <string>
#include <string_view>
#include <vector>

#include "config/shares.hpp"
#include "machine/mounts.hpp"

namespace host {

struct Volume {
  dev_t device;
  std::string path;  // where it is mounted
  VornFsKind kind;
  // Whether it holds users' data for sure. Memory file systems (/run, /dev/shm, the layers of
  // containers) do only when they are the root or when a share lies on them.
  bool holds_data;
  bool has_user_quotas = false;
};

// Every device with a visible folder of a walked kind, in mount order, at the best of its mounts:
// one of the whole file system before a part of it (bind mounts and Btrfs subvolumes are parts),
// then the root folder, then one that holds a share, then the shortest path.
std::vector<Volume> choose_volumes(const std::vector<Mount>& mounts);

struct ServerVolumes {
  std::vector<Mount> mounts;
  std::vector<Volume> volumes;

  // The volume of the file system that holds `path`, or null.
  const Volume* holding(const char* path) const;
};

// The volumes of this server; its shares are taken into account.
ServerVolumes read_volumes();

// Adds each share's volume to `hash`, as VornQazGetVolumePathHash. One log line for each share that
// is left out of every report, since its file system is not walked.
void add_volume_paths(const ServerVolumes& server, const std::vector<Share>& shares,
                      VLIBCSzHash& hash);

// Whether `path` has one of the lengths at which the program's records cut a mount path.
constexpr bool may_be_cut(std::string_view path) {
  return path.size() == 15 || path.size() == 31;
}

// The identifier of a whole mount path: at most 48 bytes of A-Z a-z 0-9 . _ - and '/'.
std::string volume_id(std::string_view path);

// The identifier for a path that may be cut: that of the volume whose path begins so; when several
// do, one of its own that ends in "...", with one syslog line; of `cut` itself when none does.
std::string cut_volume_id(const std::vector<Volume>& volumes, std::string_view cut);

}  // namespace host

#endif
