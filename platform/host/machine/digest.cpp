// Digests of files.
#include <fcntl.h>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <memory>
#include <new>

#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace host {
namespace {

enum Outcome { kDigested = 0, kFileChanged = 2, kFailed = -1 };

constexpr std::size_t kHexDigits = 32;
constexpr std::size_t kStep = std::size_t{256} * 1024;

template <auto Release>
struct ReleaseWith {
  template <typename T>
  void operator()(T* handle) const {
    Release(handle);
  }
};

// MD5 with all that can be kept from file to file. In a library context of its own, which no
// configuration of the system reaches: where that demands FIPS, the default one has no MD5. Here it
// tells copies apart and guards nothing.
class Md5 {
 public:
  // Throws std::bad_alloc when OpenSSL gives no MD5.
  Md5()
      : library_(OSSL_LIB_CTX_new()),
        algorithm_(EVP_MD_fetch(library_.get(), "MD5", nullptr)),
        context_(EVP_MD_CTX_new()) {
    if (library_ == nullptr || algorithm_ == nullptr || context_ == nullptr) {
      throw std::bad_alloc();
    }
  }

  bool begin() { return EVP_DigestInit_ex2(context_.get(), algorithm_.get(), nullptr) == 1; }
  bool add(const void* bytes, std::size_t size) {
    return EVP_DigestUpdate(context_.get(), bytes, size) == 1;
  }
  bool write_hex(char* digits) {
    constexpr char kDigits[] = "0123456789abcdef";
    std::array<unsigned char, EVP_MAX_MD_SIZE> digest{};
    if (EVP_DigestFinal_ex(context_.get(), digest.data(), nullptr) != 1) {
      return false;
    }
    for (std::size_t i = 0; i < kHexDigits / 2; ++i) {
      *digits++ = kDigits[digest[i] >> 4];
      *digits++ = kDigits[digest[i] & 15];
    }
    return true;
  }

 private:
  std::unique_ptr<OSSL_LIB_CTX, ReleaseWith<&OSSL_LIB_CTX_free>> library_;
  std::unique_ptr<EVP_MD, ReleaseWith<&EVP_MD_free>> algorithm_;
  std::unique_ptr<EVP_MD_CTX, ReleaseWith<&EVP_MD_CTX_free>> context_;
};

// Only the owner of a file and root may leave its access time alone.
Fd open_to_read(const char* path) {
  constexpr int kFlags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
  Fd fd(open(path, kFlags | O_NOATIME));
  if (!fd && errno == EPERM) {
    fd = Fd(open(path, kFlags));
  }
  return fd;
}

// Whether an open failed since the file isn't what it was: it is gone or a link, a socket or a
// device now, may not be read, or a client holds it for writing (a lease, which O_NONBLOCK doesn't
// wait for).
constexpr bool means_changed(int error) {
  return error == ENOENT || error == ENOTDIR || error == ELOOP || error == ENXIO ||
         error == ENODEV || error == ESTALE || error == EWOULDBLOCK || error == EACCES ||
         error == EPERM;
}

bool is_version(const struct stat& status, unsigned long long size) {
  return S_ISREG(status.st_mode) && static_cast<unsigned long long>(status.st_size) == size;
}

Outcome changed() {
  errno = ESTALE;
  return kFileChanged;
}

// Reads exactly `size` bytes, so that a file that grows for ever comes to an end as well.
Outcome add_content(Md5& md5, int fd, unsigned long long size) {
  static const auto buffer = std::make_unique_for_overwrite<std::byte[]>(kStep);
  while (size > 0) {
    const ssize_t got = read(fd, buffer.get(), std::min<unsigned long long>(size, kStep));
    if (got == 0) {
      return changed();
    }
    if (got < 0) {
      if (errno == EINTR) {
        continue;
      }
      return kFailed;
    }
    if (!md5.add(buffer.get(), static_cast<std::size_t>(got))) {
      errno = EIO;
      return kFailed;
    }
    size -= static_cast<unsigned long long>(got);
  }
  return kDigested;
}

Outcome digest_file(const char* path, unsigned long long size, char* digits) {
  static Md5 md5;
  const Fd fd = open_to_read(path);
  if (!fd) {
    return means_changed(errno) ? kFileChanged : kFailed;
  }
  struct stat before {};
  struct stat after {};
  if (fstat(fd.get(), &before) != 0) {
    return kFailed;
  }
  if (!is_version(before, size)) {
    return changed();
  }
  posix_fadvise(fd.get(), 0, 0, POSIX_FADV_SEQUENTIAL);
  if (!md5.begin()) {
    errno = EIO;
    return kFailed;
  }
  if (const Outcome outcome = add_content(md5, fd.get(), size); outcome != kDigested) {
    return outcome;
  }
  if (fstat(fd.get(), &after) != 0) {
    return kFailed;
  }
  if (!is_version(after, size) || after.st_mtim.tv_sec != before.st_mtim.tv_sec ||
      after.st_mtim.tv_nsec != before.st_mtim.tv_nsec) {
    return changed();
  }
  if (!md5.write_hex(digits)) {
    errno = EIO;
    return kFailed;
  }
  return kDigested;
}

}  // namespace
}  // namespace host

int VornQazGetFileMd5(const char* path, unsigned long long size, char* digest,
                      size_t digest_size) try {
  if (path == nullptr || digest == nullptr || digest_size != host::kHexDigits) {
    errno = EINVAL;
    return host::kFailed;
  }
  const int saved_errno = errno;
  const host::Outcome outcome = host::digest_file(path, size, digest);
  if (outcome == host::kDigested) {
    errno = saved_errno;
  }
  return outcome;
} catch (...) {
  errno = ENOMEM;
  return host::kFailed;
}
