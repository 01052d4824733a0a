#include "machine/mounts.hpp"

#include <fcntl.h>
#include <libmount/libmount.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string_view>
#include <unordered_set>

#include "machine/file_system.hpp"

namespace host {
namespace {

struct TableUnref {
  void operator()(libmnt_table* table) const { mnt_unref_table(table); }
};
struct IterFree {
  void operator()(libmnt_iter* iter) const { mnt_free_iter(iter); }
};
using TablePtr = std::unique_ptr<libmnt_table, TableUnref>;
using IterPtr = std::unique_ptr<libmnt_iter, IterFree>;

std::string text_or_empty(const char* text) {
  return text == nullptr ? "" : text;
}

// The names that file systems have for it; where it counts without limits, users' usage is there
// all the same. Quotas of groups and projects aren't users'.
bool has_user_quotas(const char* options) {
  const auto is_set = [options](const char* name, bool with_value = false) {
    char* value = nullptr;
    std::size_t size = 0;
    return mnt_optstr_get_option(options, name, &value, &size) == 0 && (!with_value || size > 0);
  };
  constexpr std::array kNames{"usrquota", "quota", "uquota", "uqnoenforce", "qnoenforce"};
  return options != nullptr && !is_set("noquota") &&
         (std::any_of(kNames.begin(), kNames.end(),
                      [&](const char* name) { return is_set(name); }) ||
          is_set("usrjquota", true));
}

struct Place {
  std::optional<int> mount_id;  // none from a kernel that doesn't tell
  bool is_folder;
};

std::optional<Place> place_of(const char* path, int flags) {
  struct statx found {};
  if (statx(AT_FDCWD, path, flags, STATX_TYPE | STATX_MNT_ID, &found) != 0) {
    return std::nullopt;
  }
  Place place{std::nullopt, S_ISDIR(found.stx_mode)};
  if ((found.stx_mask & STATX_MNT_ID) != 0) {
    place.mount_id = static_cast<int>(found.stx_mnt_id);
  }
  return place;
}

bool lies_below(std::string_view path, std::string_view folder) {
  return folder == "/" ||
         (path.starts_with(folder) && (path.size() == folder.size() || path[folder.size()] == '/'));
}

}  // namespace

std::vector<Mount> read_mounts(const char* table) {
  std::vector<Mount> mounts;
  const TablePtr parsed(mnt_new_table_from_file(table));
  const IterPtr iter(mnt_new_iter(MNT_ITER_FORWARD));
  if (parsed == nullptr || iter == nullptr) {
    return mounts;
  }
  libmnt_fs* fs = nullptr;
  while (mnt_table_next_fs(parsed.get(), iter.get(), &fs) == 0) {
    Mount mount;
    mount.id = mnt_fs_get_id(fs);
    mount.device = mnt_fs_get_devno(fs);
    mount.root = text_or_empty(mnt_fs_get_root(fs));
    mount.target = text_or_empty(mnt_fs_get_target(fs));
    mount.type = text_or_empty(mnt_fs_get_fstype(fs));
    mount.kind = kind_of_name(mount.type);
    mount.has_user_quotas = has_user_quotas(mnt_fs_get_options(fs));
    if (!mount.target.empty()) {
      mounts.push_back(std::move(mount));
    }
  }
  std::unordered_set<std::string_view> later;
  std::for_each(mounts.rbegin(), mounts.rend(),
                [&](Mount& mount) { mount.visible = later.insert(mount.target).second; });
  return mounts;
}

std::vector<Mount> read_own_mounts() {
  std::vector<Mount> mounts = read_mounts(kOwnMountTable);
  for (Mount& mount : mounts) {
    if (!mount.visible || !is_walked(mount.kind)) {
      continue;
    }
    const auto place = place_of(mount.target.c_str(), AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT);
    mount.visible = place && place->mount_id.value_or(mount.id) == mount.id;
    mount.is_folder = place && place->is_folder;
  }
  return mounts;
}

const Mount* mount_holding(const std::vector<Mount>& mounts, const char* path) {
  const auto place = place_of(path, 0);
  if (!place) {
    return nullptr;
  }
  if (place->mount_id) {
    for (const Mount& mount : mounts) {
      if (mount.id == *place->mount_id) {
        return &mount;
      }
    }
  }
  const std::unique_ptr<char, decltype(&std::free)> real(realpath(path, nullptr), &std::free);
  const Mount* best = nullptr;
  for (const Mount& mount : mounts) {
    if (real != nullptr && mount.visible && lies_below(real.get(), mount.target) &&
        (best == nullptr || mount.target.size() > best->target.size())) {
      best = &mount;
    }
  }
  return best;
}

}  // namespace host
