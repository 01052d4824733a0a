// The walk runs as root over folders whose owners can rename and replace them meanwhile. A path is
// looked up once, for the share's top folder; from there every folder is opened and every file
// examined by name relative to the handle of its parent, never through a link. So a user who swaps
// a folder for a link while the walk is inside can't lead it out of the share. Paths are only text
// for rows and messages.
//
// Threads look ahead (look_ahead.hpp); here their finds become rows, counts and messages, in the
// order of a walk by one.
#include "share_walk.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string_view>
#include <utility>

#include "facts/tallies.hpp"
#include "folder_listing.hpp"
#include "look_ahead.hpp"
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

bool is_walked_kind(int kind) {
  return kind == VORN_FS_EXT || kind == VORN_FS_XFS || kind == VORN_FS_COW ||
         kind == VORN_FS_MEMORY || kind == VORN_FS_CLUSTER;
}

// What a whole walk shares: one path buffer that grows and shrinks with the depth (a tree can be
// 2048 folders deep, and a buffer a level would be 8 MiB of stack).
class Walk {
 public:
  Walk(sqlite3* db, const char* share, const VLIBCSzHash* types, unsigned threads,
       std::chrono::milliseconds silence)
      : db_(db), share_(share), types_(types), ahead_(threads, silence) {}

  int top(const char* folder) {
    path_.format("%s", folder);
    top_length_ = std::strlen(folder);
    struct stat status {};
    if (stat(folder, &status) != 0) {
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
    const int handle = open(folder, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (handle < 0) {
      return open_failed();
    }
    // Replaced between the look and the open: its kind was not the one that was judged.
    struct stat now {};
    const bool is_known = fstat(handle, &now) == 0;
    if (!is_known || now.st_dev != status.st_dev) {
      const int error = is_known ? ESTALE : errno;
      close(handle);
      errno = error;
      return stat_failed();
    }
    return read_folder(ahead_.begin(handle, now, top_length_), top_length_);
  }

 private:
  // The folder of an entry, at path_ (`length` bytes).
  int subfolder(Folder& parent, const Entry& entry, size_t length) {
    if (entry.error != 0) {
      errno = entry.error;
      return stat_failed();
    }
    Folder& folder = *entry.folder;
    switch (ahead_.await(folder)) {
      case Folder::State::kForeign:
        return foreign_folder(parent, folder, length);
      case Folder::State::kFailed:
        errno = folder.error;
        return open_failed();
      default:
        return read_folder(folder, length);
    }
  }

  // One on another file system than its parent, or one that was replaced while it was looked at.
  int foreign_folder(Folder& parent, Folder& folder, size_t length) {
    const int handle = ahead_.borrow_handle(parent);
    if (handle < 0) {
      return open_failed();
    }
    // Once more when another file system stands there than the one that was judged: a folder that
    // is mounted on demand is only mounted by the first look into it.
    Opened opened = open_subfolder(handle, folder.name, parent.device);
    if (opened.result == Look::kReplaced) {
      opened = open_subfolder(handle, folder.name, parent.device);
    }
    const int error = errno;
    ahead_.give_back(parent, handle);
    errno = error;
    switch (opened.result) {
      case Look::kNotWalked:
        return 0;
      case Look::kOpened:
        ahead_.adopt(folder, opened.handle, opened.status);
        return read_folder(folder, length);
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
    int handle = -1;  // the caller's
    struct stat status {};
  };

  // Looks at a folder, judges its file system and opens it; errno says why it isn't open.
  Opened open_subfolder(int parent, const char* name, dev_t parent_device) {
    struct stat status {};
    if (look_at(parent, name, status) != 0) {
      return {Look::kUnknown};
    }
    if (!S_ISDIR(status.st_mode)) {
      errno = ENOTDIR;
      return {Look::kUnknown};
    }
    // One device is one file system, so its kind is known from the parent.
    if (status.st_dev != parent_device) {
      const int kind = VORNGetFSType(path_.c_str(), 0);
      if (!is_walked_kind(kind)) {
        return {kind < 0 ? Look::kUnknown : Look::kNotWalked};
      }
    }
    const int handle = open_folder_at(parent, name);
    if (handle < 0) {
      return {Look::kUnreadable};
    }
    struct stat opened {};
    const bool is_known = fstat(handle, &opened) == 0;
    if (!is_known || opened.st_dev != status.st_dev) {
      const int error = errno;
      close(handle);
      errno = error;
      return {is_known ? Look::kReplaced : Look::kUnknown};
    }
    return {Look::kOpened, handle, opened};
  }

  // Counts what is found while it lives as the folder's.
  class Inside {
   public:
    Inside(const Folder& folder, const char* path, CountedElsewhere elsewhere) {
      tallies().enter(folder.name, folder.device, path, elsewhere);
    }
    ~Inside() { tallies().leave(); }
    Inside(const Inside&) = delete;
    Inside& operator=(const Inside&) = delete;
  };

  int read_folder(Folder& folder, size_t length) {
    const bool counts = tally_ != nullptr && tally_->elsewhere() == CountedElsewhere::kNo;
    const Inside inside(folder, path_.c_str(),
                        note_share_folder(folder.device, folder.inode, share_, counts)
                            ? CountedElsewhere::kYes
                            : CountedElsewhere::kNo);
    if (length > top_length_ && tally_ != nullptr) {
      tally_->folder();
    }
    while (const Entry* entry = ahead_.next(folder)) {
      add_entry(folder, *entry, length);
      path_.data()[length] = '\0';
      // On a full disk every further insert would fail, each with its own fsync; the run has
      // failed.
      if (report_data_lost()) {
        return 0;
      }
    }
    if (folder.error != 0) {
      errno = folder.error;
      return open_failed();
    }
    return 0;
  }

  void add_entry(Folder& parent, const Entry& entry, size_t length) {
    if (entry.type == Entry::Type::kOther) {
      if (tally_ != nullptr) {
        tally_->other();
      }
      return;
    }
    const std::string_view name(entry.name);
    const size_t child_length = append(length, name);
    if (entry.type == Entry::Type::kFile) {
      add_file(entry, name);
    } else if (subfolder(parent, entry, child_length) < 0) {
      REPORT_LOG_ERR(kGatheringModule, __LINE__, "Failed to process [%s].\n", path_.c_str());
    }
  }

  void add_file(const Entry& entry, std::string_view name) {
    if (entry.error != 0) {
      errno = entry.error;
      stat_failed();
      return;
    }
    status_.st_size = entry.size;
    status_.st_mtime = entry.mtime;
    status_.st_blocks = entry.blocks;
    status_.st_dev = entry.device;
    status_.st_uid = entry.owner;
    status_.st_nlink = entry.links;
    const size_t dot = name.rfind('.');
    const char* label =
        dot == std::string_view::npos ? kOtherType : type_label(types_, name.data() + dot + 1);
    const FileInfo info{share_, path_.c_str(), name.data(), label, &status_};
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
    const size_t count = std::min(name.size(), kLongest - end);
    std::memcpy(path + end, name.data(), count);
    end += count;
    path[end] = '\0';
    return end;
  }

  int open_failed() {
    const int error = errno;
    // Not this folder's fault: what is missing now is missing for want of handles or memory.
    if (error == EMFILE || error == ENFILE || error == ENOMEM) {
      mark_report_data_lost();
    }
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "Failed to opendir [%s].", path_.c_str());
    count_failed(error);
    return -1;
  }

  int stat_failed() {
    const int error = errno;
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "Failed to stat [%s].", path_.c_str());
    count_failed(error);
    return -1;
  }

  // What was removed before its turn came is no longer part of the share, which lacks nothing.
  void count_failed(int error) {
    if (error != ENOENT) {
      count_unreadable();
    }
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
  PathText path_;  // of the folder or entry being looked at
  struct stat status_ {};
  LookAhead ahead_;
};

}  // namespace

int ReportShareWalk(sqlite3* db, const char* szShareName, const char* szFolderPath,
                    const VLIBCSzHash* pshFileType, unsigned threads,
                    std::chrono::milliseconds silence) {
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
  return Walk(db, szShareName, pshFileType, threads, silence).top(szFolderPath);
}

}  // namespace vornreport
