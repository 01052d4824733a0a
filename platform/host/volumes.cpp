#include "volumes.hpp"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <memory>
#include <set>
#include <tuple>

#include "file_io.hpp"
#include "file_system.hpp"
#include "shares.hpp"
#include "text_containers.hpp"
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
    volumes.push_back({mount->device, mount->target, mount->kind, holds_data});
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

std::string uncut_path(const std::vector<Volume>& volumes, std::string_view path) {
  const Volume* first = nullptr;
  for (const Volume& volume : volumes) {
    if (volume.path == path) {
      return volume.path;
    }
    if (first == nullptr && volume.path.starts_with(path)) {
      first = &volume;
    }
  }
  return first == nullptr ? std::string(path) : first->path;
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
  for (const host::Share& share : *shares) {
    const host::Volume* volume = server.holding(share.path.c_str());
    if (volume != nullptr) {
      result->set(share.name, volume->path);
    }
  }
  *hash = result.release();
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazVolumeGetId(const char* mount_path, char* id, size_t size) try {
  constexpr std::size_t kSmallestBuffer = 64;
  if (mount_path == nullptr || *mount_path == '\0' || id == nullptr || size < kSmallestBuffer) {
    errno = EINVAL;
    return -1;
  }
  const host::ErrnoKeeper keeper;
  std::string whole = mount_path;
  if (host::may_be_cut(whole)) {
    // Once for the run: a report asks for every row.
    static const host::ServerVolumes server = host::read_volumes();
    whole = host::uncut_path(server.volumes, whole);
  }
  const std::string text = host::volume_id(whole);
  std::memcpy(id, text.c_str(), text.size() + 1);
  return static_cast<int>(text.size());
} catch (...) {
  errno = ENOMEM;
  return -1;
}
