#include "machine/mounts.hpp"

#include <fcntl.h>
#include <libmount/libmount.h>
#include <sys/quota.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <optional>
#include <string_view>
#include <unordered_set>

#include "base/host_log.hpp"
#include "base/incident.hpp"
#include "base/silence.hpp"
#include "machine/file_system.hpp"
#include "vorn/base/file_io.hpp"

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

// Whether the kernel counts users' usage. ext4 and others can keep quotas inside, which are on
// whatever the options say.
bool counts_users(const std::string& target) {
  const Fd folder(open(target.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  std::uint32_t format = 0;
  return folder &&
         syscall(SYS_quotactl_fd, folder.get(), QCMD(Q_GETFMT, USRQUOTA), 0, &format) == 0;
}

struct Place {
  std::optional<int> mount_id;  // none from a kernel that doesn't tell
  bool is_folder;
};

// Nothing with errno when it can't be told.
std::optional<Place> place_of(const char* path, int flags) {
  struct statx found {};
  int result = -1;
  do {
    result = statx(AT_FDCWD, path, flags, STATX_TYPE | STATX_MNT_ID, &found);
  } while (result != 0 && errno == EINTR);
  if (result != 0) {
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

struct CloseFile {
  void operator()(FILE* file) const { std::fclose(file); }
};

// Null with errno. The text is read here: the library takes a failed read for the end of the table.
TablePtr parse_table(const char* path) {
  constexpr std::size_t kLargestTable = std::size_t{64} << 20;
  std::optional<std::string> text = read_file(path, kLargestTable);
  TablePtr table(text ? mnt_new_table() : nullptr);
  const std::unique_ptr<FILE, CloseFile> stream(
      // NOLINTNEXTLINE(clang-analyzer-cplusplus.InnerPointer): the stream ends before the text
      table && !text->empty() ? fmemopen(text->data(), text->size(), "r") : nullptr);
  if (stream == nullptr || mnt_table_parse_stream(table.get(), stream.get(), path) != 0) {
    return nullptr;
  }
  return table;
}

// Without it the report would lack every volume.
TablePtr read_table(const char* path) {
  constexpr int kMostTries = 3;
  TablePtr table;
  for (int tries = 0; table == nullptr && tries < kMostTries; ++tries) {
    table = parse_table(path);
  }
  if (table == nullptr) {
    const std::string problem = std::string("the mount table ") + path + " can't be read (" +
                                std::strerror(errno) +
                                "), so volumes are missing from the report; see to /proc";
    log_line("%s", problem.c_str());
    tell_incident("volume_unknown", path, problem);
  }
  return table;
}

}  // namespace

std::vector<Mount> read_mounts(const char* table) {
  std::vector<Mount> mounts;
  const TablePtr parsed = read_table(table);
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

bool hangs(VornFsKind kind, const std::string& target) {
  return kind == VORN_FS_CLUSTER && is_silent(target);
}

std::vector<Mount> read_own_mounts() {
  std::vector<Mount> mounts = read_mounts(kOwnMountTable);
  for (Mount& mount : mounts) {
    // One that hangs stays, too: that it can't be measured is told then.
    if (!mount.visible || !is_walked(mount.kind) || hangs(mount.kind, mount.target)) {
      continue;
    }
    const auto place = place_of(mount.target.c_str(), AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT);
    // What can't be looked at for another reason stays: that it can't be measured is told then.
    const bool is_hidden = !place && (errno == ENOENT || errno == ENOTDIR || errno == EACCES);
    mount.visible = place ? place->mount_id.value_or(mount.id) == mount.id : !is_hidden;
    mount.is_folder = place ? place->is_folder : !is_hidden;
    mount.has_user_quotas =
        mount.has_user_quotas || (mount.visible && mount.is_folder && counts_users(mount.target));
  }
  return mounts;
}

std::vector<const Mount*> shared_mounts(const std::vector<Mount>& mounts) {
  std::map<dev_t, std::size_t> counts;
  std::vector<const Mount*> found;
  for (const Mount& mount : mounts) {
    if (mount.visible && mount.is_folder && is_walked(mount.kind)) {
      ++counts[mount.device];
      found.push_back(&mount);
    }
  }
  std::erase_if(found, [&](const Mount* mount) { return counts[mount->device] < 2; });
  return found;
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
