#include "folder_listing.hpp"

#include <dirent.h>
#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <numeric>

namespace vornreport {
namespace {

constexpr std::string_view kIndexFolder = "@eaDir";
constexpr int kOpenFolder = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

// Network file systems may be interrupted, which says nothing about the file.
template <typename Call>
auto uninterrupted(Call call) {
  auto result = call();
  while (result < 0 && errno == EINTR) {
    result = call();
  }
  return result;
}

// As the kernel writes it.
struct DirectoryEntry {
  uint64_t inode;
  int64_t offset;
  unsigned short length;
  unsigned char type;
  char name[1];
};

Entry::Type type_of(unsigned char type) {
  return type == DT_REG   ? Entry::Type::kFile
         : type == DT_DIR ? Entry::Type::kFolder
                          : Entry::Type::kOther;
}

// Entries with what the folder itself says of them. `inodes`: one for each.
Listed read_entries(int handle, size_t most, Batch& batch, std::vector<uint64_t>& inodes) {
  constexpr size_t kLargest = 65536;
  constexpr size_t kUsualEntry = 32;
  thread_local std::vector<char> buffer(kLargest);
  const size_t size = std::clamp<size_t>(most * kUsualEntry, 4096, kLargest);
  std::vector<size_t> names;
  Listed listed{false, 0};
  while (batch.entries.size() < most && !listed.at_end) {
    const auto got =
        uninterrupted([&] { return syscall(SYS_getdents64, handle, buffer.data(), size); });
    listed = {got <= 0, got < 0 ? errno : 0};
    for (long at = 0; at < got;) {
      const char* raw = buffer.data() + at;
      DirectoryEntry entry{};
      std::memcpy(&entry, raw, offsetof(DirectoryEntry, name));
      const std::string_view name(raw + offsetof(DirectoryEntry, name));
      at += entry.length;
      if (name != "." && name != ".." && name != kIndexFolder) {
        names.push_back(batch.names.size());
        batch.names.append(name).push_back('\0');
        inodes.push_back(entry.inode);
        batch.entries.push_back({});
        batch.entries.back().type = type_of(entry.type);
      }
    }
  }
  for (size_t i = 0; i < names.size(); ++i) {
    batch.entries[i].name = batch.names.data() + names[i];
  }
  return listed;
}

void examine(Folder& parent, Entry& entry, std::unique_ptr<Folder>& folder) {
  const size_t path_length = parent.path_length + 1 + std::strlen(entry.name);
  struct stat status {};
  if (path_length > LookAhead::kLongestPath) {
    entry.error = ENAMETOOLONG;
  } else if (look_at(parent.handle, entry.name, status) != 0) {
    entry.error = errno;
  } else if (entry.type == Entry::Type::kFile) {
    entry.error = S_ISREG(status.st_mode) ? 0 : ESTALE;
    entry.size = status.st_size;
    entry.mtime = status.st_mtime;
    entry.blocks = status.st_blocks;
    entry.device = status.st_dev;
    entry.owner = status.st_uid;
    entry.links = static_cast<uint32_t>(status.st_nlink);
  } else if (!S_ISDIR(status.st_mode)) {
    entry.error = ENOTDIR;
  } else {
    folder = std::make_unique<Folder>();
    entry.folder = folder.get();
    folder->parent = &parent;
    folder->name = entry.name;
    folder->path_length = path_length;
    folder->device = parent.device;
    folder->state =
        status.st_dev == parent.device ? Folder::State::kFound : Folder::State::kForeign;
  }
}

// From the top folder down to the folder, without the top.
std::vector<const Folder*> way_to(const Folder& folder) {
  std::vector<const Folder*> way;
  for (const Folder* at = &folder; at->parent != nullptr; at = at->parent) {
    way.push_back(at);
  }
  std::reverse(way.begin(), way.end());
  return way;
}

const Folder& top_of(const Folder& folder) {
  const Folder* top = &folder;
  while (top->parent != nullptr) {
    top = top->parent;
  }
  return *top;
}

// For a kernel or a container without openat2().
int open_step_by_step(int top, const std::vector<const Folder*>& way) {
  int at = -1;
  for (const Folder* folder : way) {
    const int next = open_folder_at(at < 0 ? top : at, folder->name);
    const int error = errno;
    if (at >= 0) {
      close(at);
    }
    errno = error;
    at = next;
    if (at < 0) {
      return -1;
    }
  }
  return at;
}

int open_way(int top, const std::vector<const Folder*>& way) {
  std::string path;
  for (const Folder* folder : way) {
    path.append(path.empty() ? "" : "/").append(folder->name);
  }
  open_how how{};
  how.flags = static_cast<uint64_t>(kOpenFolder);
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS;
  const auto opened =
      uninterrupted([&] { return syscall(SYS_openat2, top, path.c_str(), &how, sizeof how); });
  return opened < 0 && (errno == ENOSYS || errno == EPERM || errno == EAGAIN)
             ? open_step_by_step(top, way)
             : static_cast<int>(opened);
}

}  // namespace

int look_at(int parent, const char* name, struct stat& status) {
  return uninterrupted(
      [&] { return fstatat(parent, name, &status, AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT); });
}

int open_folder_at(int parent, const char* name) {
  return uninterrupted([&] { return openat(parent, name, kOpenFolder); });
}

int open_again(const Folder& folder) {
  const int opened = open_way(top_of(folder).handle, way_to(folder));
  struct stat status {};
  if (opened >= 0 && (fstat(opened, &status) != 0 || status.st_dev != folder.device ||
                      status.st_ino != folder.inode)) {
    close(opened);
    errno = ESTALE;
    return -1;
  }
  return opened;
}

Listed list_batch(Folder& folder, size_t most, Batch& batch) {
  std::vector<uint64_t> inodes;
  const Listed listed = read_entries(folder.handle, most, batch, inodes);
  std::vector<uint32_t> order(batch.entries.size());
  std::iota(order.begin(), order.end(), 0U);
  std::sort(order.begin(), order.end(),
            [&](uint32_t one, uint32_t two) { return inodes[one] < inodes[two]; });
  // The folders found stand in the folder's order, whatever the order of the looks.
  std::vector<std::unique_ptr<Folder>> folders(batch.entries.size());
  for (const uint32_t i : order) {
    if (batch.entries[i].type != Entry::Type::kOther) {
      examine(folder, batch.entries[i], folders[i]);
    }
  }
  for (std::unique_ptr<Folder>& found : folders) {
    if (found) {
      batch.folders.push_back(std::move(found));
    }
  }
  return listed;
}

}  // namespace vornreport
