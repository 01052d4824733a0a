// The walk runs as root over folders whose owners can rename and replace them meanwhile. A path is
// looked up once, for the share's top folder; from there every folder is opened and every file
// examined by name relative to the handle of its parent, never through a link. So a user who swaps
// a folder for a link while the walk is inside can't lead it out of the share. Paths are only text
// for rows and messages.
#include "share_walk.hpp"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string_view>
#include <utility>

#include "facts/tallies.hpp"
#include "module.hpp"
#include "share_overlap.hpp"
#include "vorn/share.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

constexpr std::string_view kIndexFolder = "@eaDir";
// Link-free look-ups that don't set off an automount either: autofs is never walked.
constexpr int kNoFollow = AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT;

bool is_walked_kind(int kind) {
  return kind == VORN_FS_EXT || kind == VORN_FS_XFS || kind == VORN_FS_COW ||
         kind == VORN_FS_MEMORY || kind == VORN_FS_CLUSTER;
}

// What a whole walk shares: one path buffer that grows and shrinks with the depth (a tree can be
// 2048 folders deep, and a buffer a level would be 8 MiB of stack).
class Walk {
 public:
  Walk(sqlite3* db, const char* share, const VLIBCSzHash* types)
      : db_(db), share_(share), types_(types) {}

  int top(const char* folder) {
    path_.format("%s", folder);
    top_length_ = std::strlen(folder);
    struct stat status {};
    if (uninterrupted([&] { return stat(folder, &status); }) != 0) {
      return stat_failed();
    }
    if (!S_ISDIR(status.st_mode)) {
      errno = ENOTDIR;
      return stat_failed();
    }
    if (!is_walked_kind(VORNGetFSType(folder, 0))) {
      not_walked();
      return 0;
    }
    DirHandle opened = open_folder(
        uninterrupted([&] { return open(folder, O_RDONLY | O_DIRECTORY | O_CLOEXEC); }));
    if (!opened) {
      return open_failed();
    }
    // Replaced between the look and the open: its kind was not the one that was judged.
    struct stat now {};
    if (fstat(dirfd(opened.get()), &now) != 0) {
      return stat_failed();
    }
    if (now.st_dev != status.st_dev) {
      errno = ESTALE;
      return stat_failed();
    }
    note_overlap(now);
    return read_folder(std::move(opened), top_length_, now.st_dev);
  }

 private:
  // A folder at path_ (`length` bytes), the entry `name` of its parent.
  int subfolder(int parent, const char* name, size_t length, dev_t parent_device) {
    if (cut_) {
      errno = ENAMETOOLONG;
      return stat_failed();
    }
    // Once more when another file system stands there than the one that was judged: a folder that
    // is mounted on demand is only mounted by the first look into it.
    Opened opened = open_subfolder(parent, name, parent_device);
    if (opened.result == Look::kReplaced) {
      opened = open_subfolder(parent, name, parent_device);
    }
    switch (opened.result) {
      case Look::kNotWalked:
        return 0;
      case Look::kOpened:
        return read_folder(std::move(opened.folder), length, opened.device);
      case Look::kUnreadable:
        return open_failed();
      case Look::kReplaced:
        errno = ESTALE;
        break;
      case Look::kUnknown:
        break;
    }
    return stat_failed();
  }

  enum class Look : uint8_t { kOpened, kNotWalked, kReplaced, kUnreadable, kUnknown };
  struct Opened {
    Look result;
    DirHandle folder;
    dev_t device = 0;
  };

  // Looks at a folder, judges its file system and opens it; errno says why it isn't open.
  Opened open_subfolder(int parent, const char* name, dev_t parent_device) {
    struct stat status {};
    if (uninterrupted([&] { return fstatat(parent, name, &status, kNoFollow); }) != 0) {
      return {Look::kUnknown, nullptr};
    }
    if (!S_ISDIR(status.st_mode)) {
      errno = ENOTDIR;
      return {Look::kUnknown, nullptr};
    }
    // One device is one file system, so its kind is known from the parent.
    if (status.st_dev != parent_device) {
      const int kind = VORNGetFSType(path_.c_str(), 0);
      if (!is_walked_kind(kind)) {
        return {kind < 0 ? Look::kUnknown : Look::kNotWalked, nullptr};
      }
    }
    DirHandle folder = open_folder(uninterrupted(
        [&] { return openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC); }));
    if (!folder) {
      return {Look::kUnreadable, nullptr};
    }
    struct stat opened {};
    if (fstat(dirfd(folder.get()), &opened) != 0) {
      return {Look::kUnknown, nullptr};
    }
    if (opened.st_dev != status.st_dev) {
      return {Look::kReplaced, nullptr};
    }
    note_overlap(opened);
    return {Look::kOpened, std::move(folder), opened.st_dev};
  }

  // Network file systems may be interrupted in a look-up, which says nothing about the file.
  template <typename Call>
  static int uninterrupted(Call call) {
    int result = -1;
    do {
      result = call();
    } while (result < 0 && errno == EINTR);
    return result;
  }

  // Takes over `fd`, which is negative when the open failed.
  static DirHandle open_folder(int fd) {
    DirHandle folder(fd < 0 ? nullptr : fdopendir(fd));
    if (!folder && fd >= 0) {
      const int error = errno;
      close(fd);
      errno = error;
    }
    return folder;
  }

  int read_folder(DirHandle folder, size_t length, dev_t device) {
    if (length > top_length_ && tally_ != nullptr) {
      tally_->folder();
    }
    const int fd = dirfd(folder.get());
    int error = 0;
    while (const dirent* entry = next_entry(folder.get(), error)) {
      add_entry(fd, *entry, length, device);
      path_.data()[length] = '\0';
      cut_ = false;
      // On a full disk every further insert would fail, each with its own fsync; the run has
      // failed.
      if (report_data_lost()) {
        return 0;
      }
    }
    return error == 0 ? 0 : open_failed();
  }

  void note_overlap(const struct stat& folder) {
    if (tally_ != nullptr) {
      note_share_folder(folder.st_dev, folder.st_ino, share_);
    }
  }

  // Null at the end of the folder with `error` 0, or when it can't be read on, with errno and
  // `error` saying why.
  static const dirent* next_entry(DIR* folder, int& error) {
    const int before = errno;
    const dirent* entry = nullptr;
    do {
      errno = 0;
      entry = readdir(folder);
      error = errno;
    } while (entry == nullptr && error == EINTR);
    if (error == 0) {
      errno = before;
    }
    return entry;
  }

  void add_entry(int parent, const dirent& entry, size_t length, dev_t device) {
    const std::string_view name(entry.d_name);
    if (name == "." || name == ".." || name == kIndexFolder) {
      return;
    }
    if (entry.d_type != DT_DIR && entry.d_type != DT_REG) {
      if (tally_ != nullptr) {
        tally_->other();
      }
      return;
    }
    const size_t child_length = append(length, name);
    if (entry.d_type == DT_REG) {
      add_file(parent, name);
    } else if (subfolder(parent, entry.d_name, child_length, device) < 0) {
      REPORT_LOG_ERR(kGatheringModule, __LINE__, "Failed to process [%s].\n", path_.c_str());
    }
  }

  void add_file(int parent, std::string_view name) {
    struct stat status {};
    if (cut_) {
      errno = ENAMETOOLONG;
      stat_failed();
      return;
    }
    if (uninterrupted([&] { return fstatat(parent, name.data(), &status, kNoFollow); }) != 0) {
      stat_failed();
      return;
    }
    if (!S_ISREG(status.st_mode)) {
      errno = ESTALE;
      stat_failed();
      return;
    }
    const size_t dot = name.rfind('.');
    const char* label =
        dot == std::string_view::npos ? kOtherType : type_label(types_, name.data() + dot + 1);
    const FileInfo info{share_, path_.c_str(), name.data(), label, &status};
    if (ReportDBAddFile(db_, &info) < 0) {
      REPORT_LOG_ERR(kGatheringModule, __LINE__, "Failed to add to db [%s].\n", path_.c_str());
      count_unreadable();
      return;
    }
    tallies().file(info, RowSource::kWalk);
  }

  // Puts "/name" behind the first `length` bytes of path_. Its new length; what doesn't fit is cut.
  size_t append(size_t length, std::string_view name) {
    constexpr size_t kLongest = PathText::size() - 1;
    char* path = path_.data();
    size_t end = length;
    if (end < kLongest) {
      path[end++] = '/';
    }
    const size_t room = kLongest - end;
    cut_ = name.size() > room || end == length;
    const size_t count = cut_ ? room : name.size();
    std::memcpy(path + end, name.data(), count);
    end += count;
    path[end] = '\0';
    return end;
  }

  int open_failed() {
    // Not this folder's fault: what is missing now is missing for want of handles or memory.
    if (errno == EMFILE || errno == ENFILE || errno == ENOMEM) {
      mark_report_data_lost();
    }
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "Failed to opendir [%s].", path_.c_str());
    count_unreadable();
    return -1;
  }

  int stat_failed() {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "Failed to stat [%s].", path_.c_str());
    count_unreadable();
    return -1;
  }

  void count_unreadable() {
    if (tally_ != nullptr) {
      tally_->unreadable();
    }
  }

  void not_walked() {
    if (tally_ != nullptr) {
      tally_->missing();
    }
  }

  sqlite3* db_;
  const char* share_;
  const VLIBCSzHash* types_;
  ShareTally* tally_ = tallies().share();  // null when nobody counts
  size_t top_length_ = 0;
  PathText path_;     // of the folder or entry being looked at
  bool cut_ = false;  // path_ is no real path: its end is missing
};

}  // namespace

int ReportShareWalk(sqlite3* db, const char* szShareName, const char* szFolderPath,
                    const VLIBCSzHash* pshFileType) {
  const char* missing = nullptr;
  if (db == nullptr) {
    missing = "((void *)0) != db";
  } else if (szShareName == nullptr) {
    missing = "((void *)0) != szShareName";
  } else if (szFolderPath == nullptr) {
    missing = "((void *)0) != szFolderPath";
  } else if (pshFileType == nullptr) {
    missing = "NULL != pshFileType";
  }
  if (missing != nullptr) {
    report_invalid_argument(kGatheringModule, __LINE__, missing);
    return -1;
  }
  return Walk(db, szShareName, pshFileType).top(szFolderPath);
}

}  // namespace vornreport
