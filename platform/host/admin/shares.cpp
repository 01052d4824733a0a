#include "vorn/admin/shares.hpp"

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "config/shares.hpp"
#include "machine/file_system.hpp"
#include "machine/mounts.hpp"
#include "vorn/paths.h"

namespace admin {
namespace {

std::string text_or_empty(const char* text) {
  return text == nullptr ? "" : text;
}

bool lies_in(std::string_view path, std::string_view folder) {
  return folder == "/" || path == folder ||
         (path.starts_with(folder) && path[folder.size()] == '/');
}

// `below` is empty or begins with a slash.
std::string joined(const std::string& root, const std::string& below) {
  const std::string path = (root == "/" ? "" : root) + (below == "/" ? "" : below);
  return path.empty() ? "/" : path;
}

}  // namespace

std::optional<std::vector<Share>> read_shares() {
  const auto read = host::load_shares(VORN_PATH_SHARES);
  if (!read) {
    return std::nullopt;
  }
  std::vector<Share> shares(read->size());
  std::transform(read->begin(), read->end(), shares.begin(), [](const host::Share& share) {
    return Share{share.name, share.path, share.path_error, share.file_index, share.network};
  });
  return shares;
}

std::string share_name_problem(std::string_view name) {
  return text_or_empty(host::share_name_error(name));
}

std::string share_path_problem(std::string_view path) {
  return text_or_empty(host::share_path_error(path));
}

std::optional<FileSystem> file_system_of(const std::string& path) {
  const std::vector<host::Mount> mounts = host::read_own_mounts();
  const host::Mount* mount = host::mount_holding(mounts, path.c_str());
  if (mount == nullptr) {
    return std::nullopt;
  }
  return FileSystem{mount->type, host::is_walked(mount->kind), mount->kind == VORN_FS_REMOTE};
}

std::vector<Place> places_of(const std::string& path) {
  const std::unique_ptr<char, decltype(&std::free)> real(realpath(path.c_str(), nullptr),
                                                         &std::free);
  const std::vector<host::Mount> mounts = host::read_own_mounts();
  const host::Mount* own = real ? host::mount_holding(mounts, real.get()) : nullptr;
  std::vector<Place> places;
  for (const host::Mount& mount : mounts) {
    const bool is_below = own != nullptr && &mount != own && mount.visible && mount.is_folder &&
                          lies_in(mount.target, real.get());
    if (&mount == own) {
      const std::size_t above = mount.target == "/" ? 0 : mount.target.size();
      places.push_back({mount.device, joined(mount.root, real.get() + above)});
    } else if (is_below) {
      places.push_back({mount.device, mount.root});
    }
  }
  return places;
}

bool overlap(const std::vector<Place>& one, const std::vector<Place>& other) {
  return std::any_of(one.begin(), one.end(), [&](const Place& a) {
    return std::any_of(other.begin(), other.end(), [&](const Place& b) {
      return a.device == b.device && (lies_in(a.path, b.path) || lies_in(b.path, a.path));
    });
  });
}

}  // namespace admin
