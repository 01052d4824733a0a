#include "machine/handle_vfs.hpp"

#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace host {
namespace {

// What SQLite holds of an open file.
struct File {
  sqlite3_file base;
  const HandleVfs* source;
};

const HandleVfs& source_of(sqlite3_file* file) {
  return *reinterpret_cast<const File*>(file)->source;
}

int read_bytes(sqlite3_file* file, void* out, int count, sqlite3_int64 offset) {
  const HandleVfs& source = source_of(file);
  auto* to = static_cast<char*>(out);
  while (count > 0) {
    const ssize_t got = pread(source.fd(), to, static_cast<size_t>(count), offset);
    if (got < 0 && errno != EINTR) {
      return SQLITE_IOERR_READ;
    }
    if (got == 0) {
      std::memset(to, 0, static_cast<size_t>(count));  // as SQLite wants what isn't there
      return SQLITE_IOERR_SHORT_READ;
    }
    if (got > 0) {
      to += got;
      offset += got;
      count -= static_cast<int>(got);
    }
  }
  return SQLITE_OK;
}

const sqlite3_io_methods kMethods = {
    .iVersion = 1,
    .xClose = [](sqlite3_file*) { return SQLITE_OK; },
    .xRead = read_bytes,
    .xWrite = [](sqlite3_file*, const void*, int, sqlite3_int64) { return SQLITE_READONLY; },
    .xTruncate = [](sqlite3_file*, sqlite3_int64) { return SQLITE_READONLY; },
    .xSync = [](sqlite3_file*, int) { return SQLITE_OK; },
    .xFileSize =
        [](sqlite3_file* file, sqlite3_int64* size) {
          *size = source_of(file).size();
          return SQLITE_OK;
        },
    .xLock = [](sqlite3_file*, int) { return SQLITE_OK; },
    .xUnlock = [](sqlite3_file*, int) { return SQLITE_OK; },
    .xCheckReservedLock =
        [](sqlite3_file*, int* locked) {
          *locked = 0;
          return SQLITE_OK;
        },
    .xFileControl = [](sqlite3_file*, int, void*) { return SQLITE_NOTFOUND; },
    .xSectorSize = [](sqlite3_file*) { return 4096; },
    // One that can't change has no journal, and no log of writes whatever its header says.
    .xDeviceCharacteristics = [](sqlite3_file*) { return SQLITE_IOCAP_IMMUTABLE; },
    .xShmMap = nullptr,
    .xShmLock = nullptr,
    .xShmBarrier = nullptr,
    .xShmUnmap = nullptr,
    .xFetch = nullptr,
    .xUnfetch = nullptr};

// Only the database itself: a journal or temporary file would have to be on disk.
int open_file(sqlite3_vfs* vfs, const char*, sqlite3_file* file, int flags, int* out_flags) {
  file->pMethods = nullptr;
  if ((flags & SQLITE_OPEN_MAIN_DB) == 0) {
    return SQLITE_CANTOPEN;
  }
  auto* opened = reinterpret_cast<File*>(file);
  opened->base.pMethods = &kMethods;
  opened->source = static_cast<const HandleVfs*>(vfs->pAppData);
  if (out_flags != nullptr) {
    *out_flags = SQLITE_OPEN_MAIN_DB | SQLITE_OPEN_READONLY;
  }
  return SQLITE_OK;
}

int is_there(sqlite3_vfs*, const char*, int, int* result) {
  *result = 0;
  return SQLITE_OK;
}

int full_name(sqlite3_vfs*, const char* name, int size, char* out) {
  sqlite3_snprintf(size, out, "%s", name);
  return SQLITE_OK;
}

// Time, sleep and random numbers are the system's.
sqlite3_vfs base_vfs() {
  const sqlite3_vfs* system = sqlite3_vfs_find(nullptr);
  return system != nullptr ? *system : sqlite3_vfs{};
}

}  // namespace

HandleVfs::HandleVfs(int fd, off_t size) : fd_(fd), size_(size), vfs_(base_vfs()) {
  vfs_.iVersion = 1;
  vfs_.szOsFile = sizeof(File);
  vfs_.pNext = nullptr;
  vfs_.zName = "vorn-handle";
  vfs_.pAppData = this;
  vfs_.xOpen = open_file;
  vfs_.xDelete = [](sqlite3_vfs*, const char*, int) { return SQLITE_READONLY; };
  vfs_.xAccess = is_there;
  vfs_.xFullPathname = full_name;
  sqlite3_vfs_register(&vfs_, 0);
}

HandleVfs::~HandleVfs() {
  sqlite3_vfs_unregister(&vfs_);
}

}  // namespace host
