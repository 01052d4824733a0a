#include "vorn/admin/shares.hpp"

#include <algorithm>

#include "config/shares.hpp"
#include "machine/file_system.hpp"
#include "machine/mounts.hpp"
#include "vorn/paths.h"

namespace admin {
namespace {

std::string text_or_empty(const char* text) {
  return text == nullptr ? "" : text;
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

}  // namespace admin
