#include "vornreport/report_data.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "vorn/paths.h"
#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

bool g_data_lost = false;

// A file below its folder's handle: no link, nothing but a regular file, and no second name of one
// that is elsewhere. Null with errno otherwise.
FileHandle open_own_file(const std::string& path, const char* mode) {
  const std::size_t slash = path.rfind('/') + 1;  // 0 without a slash: npos wraps around
  const int folder =
      open(slash > 0 ? path.substr(0, slash).c_str() : ".", O_PATH | O_DIRECTORY | O_CLOEXEC);
  if (folder < 0) {
    return nullptr;
  }
  const int access = std::strchr(mode, '+') != nullptr ? O_RDWR : O_WRONLY;
  const int file = openat(folder, path.c_str() + slash,
                          access | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC |
                              (*mode == 'a' ? O_APPEND : 0),
                          0666);
  const int error = errno;
  close(folder);
  errno = error;
  struct stat status {};
  if (file < 0 || fstat(file, &status) != 0) {
    return nullptr;
  }
  const bool is_own = S_ISREG(status.st_mode) && status.st_nlink == 1;
  FileHandle opened(is_own && (*mode == 'a' || ftruncate(file, 0) == 0) ? fdopen(file, mode)
                                                                        : nullptr);
  if (!opened) {
    const int why = is_own ? errno : EEXIST;
    close(file);
    errno = why;
  }
  return opened;
}

void lose(Costs costs) {
  if (costs == Costs::kRun) {
    mark_report_data_lost();
  }
}

}  // namespace

PathText report_data_path() {
  PathText path;
  path.format(VORN_TMP_DATA_FORMAT, static_cast<unsigned>(getpid()));
  return path;
}

FileHandle open_report_file(const char* path, const char* mode, const char* module, int line,
                            LogForm form, Costs costs) {
  FileHandle file = open_own_file(path, mode);
  if (!file) {
    if (form == LogForm::kNested) {
      REPORT_LOG_ERR_NESTED(module, line, "open file=%s failed", path);
    } else {
      REPORT_LOG_ERR(module, line, "open file=%s failed\n", path);
    }
    lose(costs);
  }
  return file;
}

bool close_report_file(FileHandle file, const char* path, const char* module, int line,
                       Costs costs) {
  if (!file) {
    return true;
  }
  const bool wrote = std::ferror(file.get()) == 0 && std::fflush(file.get()) == 0;
  const int error = errno;
  const bool closed = std::fclose(file.release()) == 0;
  if (wrote && closed) {
    return true;
  }
  if (!wrote) {
    errno = error;  // what the close says after a failed write is beside the point
  }
  REPORT_LOG_ERR_NESTED(module, line, "write file=%s failed, the report would be incomplete", path);
  lose(costs);
  return false;
}

void mark_report_data_lost() {
  g_data_lost = true;
}

bool report_data_lost() {
  return g_data_lost;
}

bool is_storage_failure(int result) {
  const int primary = result & 0xFF;
  return primary == SQLITE_FULL || primary == SQLITE_IOERR || primary == SQLITE_CORRUPT ||
         primary == SQLITE_READONLY || primary == SQLITE_CANTOPEN || primary == SQLITE_NOTADB ||
         primary == SQLITE_NOMEM || primary == SQLITE_BUSY || primary == SQLITE_LOCKED;
}

}  // namespace vornreport
