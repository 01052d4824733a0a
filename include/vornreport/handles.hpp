// Owners of the C handles that the program works with: one stateless-deleter unique_ptr each, so
// that an early return is one line and leaks nothing.
#pragma once

#include <dirent.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cstdio>
#include <memory>
#include <utility>

#include "vorn/text.h"
#include "vorn/user.h"
#include "vorn/volume.h"

namespace vornreport {

template <auto Release>
struct ReleaseWith {
  template <typename T>
  void operator()(T* handle) const noexcept {
    static_cast<void>(Release(handle));  // whatever it returns: there is nobody left to tell
  }
};

// With the statements that the connection keeps, which would hold it open.
inline int close_sqlite(sqlite3* db) {
  while (sqlite3_stmt* kept = sqlite3_next_stmt(db, nullptr)) {
    sqlite3_finalize(kept);
  }
  return sqlite3_close(db);
}

using SqliteHandle = std::unique_ptr<sqlite3, ReleaseWith<&close_sqlite>>;
using SqliteText = std::unique_ptr<char, ReleaseWith<&sqlite3_free>>;
using FileHandle = std::unique_ptr<FILE, ReleaseWith<&std::fclose>>;
using DirHandle = std::unique_ptr<DIR, ReleaseWith<&closedir>>;
using HashHandle = std::unique_ptr<VLIBCSzHash, ReleaseWith<&VLIBCSzHashFree>>;
using UserHandle = std::unique_ptr<VORNUser, ReleaseWith<&VORNUserFree>>;
using VolumesHandle = std::unique_ptr<VORNMountVolInfo, ReleaseWith<&VORNMountVolInfoFree>>;
using ListHandle = std::unique_ptr<VLIBCSzList, ReleaseWith<&VLIBCSzListFree>>;

// Owns a file descriptor; -1 is none.
class Descriptor {
 public:
  Descriptor() = default;
  explicit Descriptor(int fd) : fd_(fd) {}
  Descriptor(Descriptor&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
  Descriptor& operator=(Descriptor&& other) noexcept {
    std::swap(fd_, other.fd_);
    return *this;
  }
  ~Descriptor() {
    if (fd_ >= 0) {
      close(fd_);
    }
  }

  int get() const { return fd_; }
  explicit operator bool() const { return fd_ >= 0; }

 private:
  int fd_ = -1;
};

// Runs a platform call that fills or replaces a hash or list through its address:
// `with_address(hash, [&](VLIBCSzHash** h) { return VORNFill(h); })`. The owner follows the handle.
template <typename Handle, typename Call>
int with_address(Handle& handle, Call&& call) {
  auto* raw = handle.release();
  const int result = call(&raw);
  handle.reset(raw);
  return result;
}

// The value of a profile key; null both for an absent key and for an empty value, which every
// reader treats alike as not set.
inline const char* set_value(const VLIBCSzHash* hash, const char* key) {
  const char* value = VLIBCSzHashGetValue(hash, key);
  return value != nullptr && *value != '\0' ? value : nullptr;
}

inline bool is_unset(const char* text) {
  return text == nullptr || *text == '\0';
}

// Slots asked for when a platform hash or list is made.
inline constexpr size_t kPlatformSlots = 512;

}  // namespace vornreport
