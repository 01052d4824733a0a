// SQLite on an open file, for databases that somebody else keeps.
#ifndef VORN_HOST_HANDLE_VFS_HPP
#define VORN_HOST_HANDLE_VFS_HPP

#include <sqlite3.h>
#include <sys/types.h>

namespace host {

// While it lives, a database opened through it (read-only, under any name) is the file `fd`, of
// which `size` bytes count. Beside that file nothing is looked for, opened or removed: told a path,
// SQLite would play back a journal that lies there, and remove the files that the journal names.
// Nothing is written or locked either. One at a time.
class HandleVfs {
 public:
  HandleVfs(int fd, off_t size);
  HandleVfs(const HandleVfs&) = delete;
  HandleVfs& operator=(const HandleVfs&) = delete;
  ~HandleVfs();

  // For sqlite3_open_v2; it fails when the VFS couldn't be registered.
  const char* name() const { return vfs_.zName; }
  int fd() const { return fd_; }
  off_t size() const { return size_; }

 private:
  int fd_;
  off_t size_;
  sqlite3_vfs vfs_;
};

}  // namespace host

#endif
