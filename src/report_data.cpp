#include "vornreport/report_data.hpp"

#include <unistd.h>

#include <cerrno>

#include "vorn/paths.h"
#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

bool g_data_lost = false;

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
  FileHandle file(std::fopen(path, mode));
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
