#include "machine/volumes.hpp"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <map>
#include <memory>
#include <set>
#include <tuple>

#include "base/host_log.hpp"
#include "base/silence.hpp"
#include "base/text_containers.hpp"
#include "config/shares.hpp"
#include "machine/file_system.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/volume.h"

namespace host {
namespace {

constexpr std::size_t kIdLimit = 48;

// What makes one mount stand for its device; the greatest does.
auto rank(const Mount& mount) {
  return std::tuple(mount.root == "/", mount.target == "/", mount.holds_share,
                    std::numeric_limits<std::size_t>::max() - mount.target.size());
}

constexpr bool is_safe(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '.' ||
         c == '_' || c == '-' || c == '/';
}

// FNV-1a, folded to 32 bits: any fixed hash does, but it must never change, since identifiers are
// compared between runs.
std::uint32_t hash_of(std::string_view text) {
  std::uint64_t hash = 0xCBF29CE484222325ULL;
  for (const char c : text) {
    hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001B3ULL;
  }
  return static_cast<std::uint32_t>(hash ^ (hash >> 32));
}

}  // namespace

std::vector<Volume> choose_volumes(const std::vector<Mount>& mounts) {
  std::vector<const Mount*> best;
  std::set<dev_t> shared;
  for (const Mount& mount : mounts) {
    if (!mount.visible || !mount.is_folder || !is_walked(mount.kind)) {
      continue;
    }
    if (mount.holds_share) {
      shared.insert(mount.device);
    }
    const auto same = std::find_if(best.begin(), best.end(), [&](const Mount* other) {
      return other->device == mount.device;
    });
    if (same == best.end()) {
      best.push_back(&mount);
    } else if (rank(mount) > rank(**same)) {
      *same = &mount;
    }
  }
  std::vector<Volume> volumes;
  for (const Mount* mount : best) {
    const bool holds_data =
        mount->kind != VORN_FS_MEMORY || mount->target == "/" || shared.contains(mount->device);
    volumes.push_back(
        {mount->device, mount->target, mount->kind, holds_data, mount->has_user_quotas});
  }
  return volumes;
}

const Volume* ServerVolumes::holding(const char* path) const {
  const Mount* mount = mount_holding(mounts, path);
  if (mount == nullptr) {
    return nullptr;
  }
  const auto found = std::find_if(volumes.begin(), volumes.end(), [&](const Volume& volume) {
    return volume.device == mount->device;
  });
  return found == volumes.end() ? nullptr : &*found;
}

ServerVolumes read_volumes() {
  ServerVolumes server{read_own_mounts(), {}};
  if (const auto* shares = all_shares(); shares != nullptr) {
    for (const Share& share : *shares) {
      if (is_silent(share.path)) {
        continue;
      }
      // The mount is this vector's own element.
      const Mount* mount = mount_holding(server.mounts, share.path.c_str());
      if (mount != nullptr) {
        server.mounts[static_cast<std::size_t>(mount - server.mounts.data())].holds_share = true;
      }
    }
  }
  server.volumes = choose_volumes(server.mounts);
  return server;
}

std::string volume_id(std::string_view path) {
  if (path.size() <= kIdLimit && std::all_of(path.begin(), path.end(), is_safe)) {
    return std::string(path);
  }
  char hash[10];
  const int hash_length = std::snprintf(hash, sizeof hash, "-%08x", hash_of(path));
  std::string id(path.substr(0, kIdLimit - static_cast<std::size_t>(hash_length)));
  std::replace_if(
      id.begin(), id.end(), [](char c) { return !is_safe(c); }, '_');
  return id + hash;
}

std::string cut_volume_id(const std::vector<Volume>& volumes, std::string_view cut) {
  std::vector<const Volume*> meant;
  for (const Volume& volume : volumes) {
    if (volume.path.starts_with(cut) && (volume.holds_data || volume.path == cut)) {
      meant.push_back(&volume);
    }
  }
  if (meant.size() < 2) {
    return volume_id(meant.empty() ? cut : meant.front()->path);
  }
  std::string id = volume_id(cut) + "...";
  log_line(
      "volumes \"%s\" and \"%s\" have the first %zu bytes in common, so that reports can't "
      "tell them apart and call both %s; mount one of them at another path",
      meant[0]->path.c_str(), meant[1]->path.c_str(), cut.size(), id.c_str());
  return id;
}

namespace {

// Once for the run: a report asks for every row.
const std::string& known_cut_volume_id(const std::string& cut) {
  static const ServerVolumes server = read_volumes();
  static std::map<std::string, std::string> known;
  auto entry = known.find(cut);
  if (entry == known.end()) {
    entry = known.emplace(cut, cut_volume_id(server.volumes, cut)).first;
  }
  return entry->second;
}

// One line for a share that adds nothing to any report.
void tell_unwalked(const Share& share, const Mount& mount) {
  if (mount.kind == VORN_FS_REMOTE) {
    log_line(
        "share \"%s\" is left out: %s is on a network file system (%s); to walk it all the "
        "same run vornctl share set '%s' --network",
        share.name.c_str(), share.path.c_str(), mount.type.c_str(), share.name.c_str());
  } else {
    log_line("share \"%s\": %s is on a file system that is not walked (%s); it adds nothing",
             share.name.c_str(), share.path.c_str(), mount.type.c_str());
  }
}

}  // namespace

void add_volume_paths(const ServerVolumes& server, const std::vector<Share>& shares,
                      VLIBCSzHash& hash) {
  for (const Share& share : shares) {
    if (is_silent(share.path)) {
      continue;
    }
    const Volume* volume = server.holding(share.path.c_str());
    if (volume != nullptr) {
      hash.set(share.name, volume->path);
    } else if (const Mount* mount = mount_holding(server.mounts, share.path.c_str());
               mount != nullptr && !is_walked(mount->kind)) {
      if (mount->kind == VORN_FS_REMOTE && share.network) {
        hash.set(share.name, mount->target);
      } else {
        tell_unwalked(share, *mount);
      }
    }
  }
}

}  // namespace host

int VornQazGetVolumePathHash(VLIBCSzHash** hash) try {
  if (hash == nullptr) {
    errno = EINVAL;
    return -1;
  }
  *hash = nullptr;
  const auto* shares = host::all_shares();
  if (shares == nullptr) {
    return -1;
  }
  const host::ErrnoKeeper keeper;  // a share whose folder is gone is left out: no failure
  const host::ServerVolumes server = host::read_volumes();
  auto result = std::make_unique<VLIBCSzHash>(shares->size());
  host::add_volume_paths(server, *shares, *result);
  *hash = result.release();
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VORNVolumeOfPath(const char* path, char* mount_path, size_t size) try {
  if (path == nullptr || mount_path == nullptr || size == 0) {
    errno = EINVAL;
    return -1;
  }
  *mount_path = '\0';
  const int saved_errno = errno;
  const host::ServerVolumes server = host::read_volumes();
  errno = 0;
  const host::Mount* mount = host::mount_holding(server.mounts, path);
  if (mount == nullptr) {
    errno = errno != 0 ? errno : ENOENT;  // what failed, if anything
    return -1;
  }
  const host::Volume* volume = server.holding(path);
  const std::string& text = volume != nullptr && volume->holds_data ? volume->path : mount->target;
  if (text.size() >= size) {
    errno = ENAMETOOLONG;
    return -1;
  }
  std::memcpy(mount_path, text.c_str(), text.size() + 1);
  errno = saved_errno;
  return static_cast<int>(text.size());
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VORNMountSharedEnum(VLIBCSzList** list) try {
  if (list == nullptr || *list == nullptr) {
    errno = EINVAL;
    return -1;
  }
  const host::ErrnoKeeper keeper;
  const std::vector<host::Mount> mounts = host::read_own_mounts();
  int count = 0;
  for (const host::Mount* mount : host::shared_mounts(mounts)) {
    if (!host::hangs(mount->kind, mount->target)) {
      (*list)->texts.push_back(mount->target);
      ++count;
    }
  }
  return count;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VORNVolumeHasQuotas(const char* mount_path) try {
  const host::ErrnoKeeper keeper;
  if (mount_path == nullptr) {
    return 0;
  }
  const auto mounts = host::read_own_mounts();
  const bool found = std::any_of(mounts.begin(), mounts.end(), [=](const host::Mount& mount) {
    return mount.visible && mount.has_user_quotas && mount.target == mount_path;
  });
  return found ? 1 : 0;
} catch (...) {
  return 0;
}

int VornQazVolumeGetId(const char* mount_path, char* id, size_t size) try {
  constexpr std::size_t kSmallestBuffer = 64;
  if (mount_path == nullptr || *mount_path == '\0' || id == nullptr || size < kSmallestBuffer) {
    errno = EINVAL;
    return -1;
  }
  const host::ErrnoKeeper keeper;
  const std::string text = host::may_be_cut(mount_path) ? host::known_cut_volume_id(mount_path)
                                                        : host::volume_id(mount_path);
  std::memcpy(id, text.c_str(), text.size() + 1);
  return static_cast<int>(text.size());
} catch (...) {
  errno = ENOMEM;
  return -1;
}
