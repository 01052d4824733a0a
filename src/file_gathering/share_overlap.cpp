#include "share_overlap.hpp"

#include <sys/stat.h>

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

#include "facts/run_facts.hpp"
#include "vorn/volume.h"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

struct ShareFolder {
  std::string share;
  dev_t device;
  ino_t inode;
  std::string real_path;
};
std::vector<ShareFolder> g_folders;

// What a walk may come to by several ways: the folders that are mounted below shares, and then also
// the shares' tops, which may lie in such a folder.
struct MountedFolder {
  dev_t device;
  ino_t inode;
  std::string share;  // that counts it; empty until a walk comes by
};
std::vector<MountedFolder> g_mounted;

void tell(const std::string& one, const std::string& two) {
  const auto& [first, second] = std::minmax(one, two);
  record_incident(
      "share_overlap", first + ", " + second,
      "shares " + first + " and " + second +
          " hold the same files, so sums over shares count them twice; leave one of them "
          "out with share_list");
}

bool lies_in(const std::string& path, const std::string& folder) {
  return path == folder || path.starts_with(folder.ends_with('/') ? folder : folder + "/");
}

bool was_passed(dev_t device, ino_t inode, const char* share) {
  for (MountedFolder& folder : g_mounted) {
    if (folder.inode != inode || folder.device != device) {
      continue;
    }
    if (folder.share.empty()) {
      folder.share = share;
      return false;
    }
    if (folder.share != share) {
      tell(share, folder.share);
    }
    return true;
  }
  return false;
}

}  // namespace

void forget_share_folders() {
  g_folders.clear();
  g_mounted.clear();
}

void add_share_folder(const char* share, const char* path) {
  struct stat status {};
  const std::unique_ptr<char, decltype(&std::free)> real(realpath(path, nullptr), &std::free);
  if (real && stat(real.get(), &status) == 0) {
    g_folders.push_back({share, status.st_dev, status.st_ino, real.get()});
  }
}

void add_mounted_folders() {
  ListHandle mounts(VLIBCSzListAlloc(kPlatformSlots));
  if (!mounts || with_address(mounts, VORNMountSharedEnum) <= 0) {
    return;
  }
  for (int i = 0; i < VLIBCSzListCount(mounts.get()); ++i) {
    const std::string path = VLIBCSzListGet(mounts.get(), i);
    struct stat status {};
    const bool is_below =
        std::any_of(g_folders.begin(), g_folders.end(), [&](const ShareFolder& folder) {
          return path != folder.real_path && lies_in(path, folder.real_path);
        });
    if (is_below && stat(path.c_str(), &status) == 0) {
      g_mounted.push_back({status.st_dev, status.st_ino, ""});
    }
  }
  if (!g_mounted.empty()) {
    for (const ShareFolder& folder : g_folders) {
      g_mounted.push_back({folder.device, folder.inode, ""});
    }
  }
}

bool note_share_folder(dev_t device, ino_t inode, const char* share, bool counts) {
  const std::string* first = nullptr;  // of those that have this folder
  bool is_top = false;
  for (const ShareFolder& folder : g_folders) {
    if (folder.inode != inode || folder.device != device) {
      continue;
    }
    first = first == nullptr ? &folder.share : first;
    is_top = is_top || folder.share == share;
    if (folder.share != share) {
      tell(share, folder.share);
    }
  }
  const bool others_count = first != nullptr && (!is_top || *first != share);
  return others_count || (counts && was_passed(device, inode, share));
}

std::vector<std::string> note_index_share(const char* share) {
  std::vector<std::string> counted;
  const auto own = std::find_if(g_folders.begin(), g_folders.end(),
                                [&](const ShareFolder& folder) { return folder.share == share; });
  if (own == g_folders.end()) {
    return counted;
  }
  for (const ShareFolder& other : g_folders) {
    const bool is_inside = lies_in(other.real_path, own->real_path);
    if (&other == &*own || (!is_inside && !lies_in(own->real_path, other.real_path))) {
      continue;
    }
    tell(share, other.share);
    if (other.real_path == own->real_path ? &other < &*own : is_inside) {
      counted.push_back(
          other.real_path.substr(std::min(own->real_path.size() + 1, other.real_path.size())));
    }
  }
  return counted;
}

}  // namespace vornreport
