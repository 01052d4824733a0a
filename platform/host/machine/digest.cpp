// Digests of files.
#include <fcntl.h>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstddef>
#include <cstring>
#include <memory>
#include <new>
#include <optional>
#include <string_view>

#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace host {
namespace {

using Clock = std::chrono::steady_clock;

enum Outcome { kDigested = 0, kFileChanged = 2, kFailed = -1 };

constexpr std::size_t kHexDigits = 32;
// What is left out when it is all zeros. Aligned, so that it doesn't depend on the holes.
constexpr std::size_t kBlock = std::size_t{1} << 20U;

// Of this, 16 bytes are MD5's.
using Digest = std::array<unsigned char, EVP_MAX_MD_SIZE>;

template <auto Release>
struct ReleaseWith {
  template <typename T>
  void operator()(T* handle) const {
    Release(handle);
  }
};

// What all threads share of MD5. In a library context of its own, which no configuration of the
// system reaches: where that demands FIPS, the default one has no MD5. Here it tells copies apart
// and guards nothing.
class Algorithm {
 public:
  // Throws std::bad_alloc when OpenSSL gives no MD5.
  Algorithm() : library_(OSSL_LIB_CTX_new()), md5_(EVP_MD_fetch(library_.get(), "MD5", nullptr)) {
    if (library_ == nullptr || md5_ == nullptr) {
      throw std::bad_alloc();
    }
  }

  const EVP_MD* md5() const { return md5_.get(); }

 private:
  std::unique_ptr<OSSL_LIB_CTX, ReleaseWith<&OSSL_LIB_CTX_free>> library_;
  std::unique_ptr<EVP_MD, ReleaseWith<&EVP_MD_free>> md5_;
};

const Algorithm& algorithm() {
  static const Algorithm shared;
  return shared;
}

// MD5 with all that can be kept from file to file; a thread's own.
class Md5 {
 public:
  // Throws std::bad_alloc when OpenSSL gives none.
  Md5() : context_(EVP_MD_CTX_new()) {
    if (context_ == nullptr) {
      throw std::bad_alloc();
    }
  }

  bool begin() { return EVP_DigestInit_ex2(context_.get(), algorithm().md5(), nullptr) == 1; }
  bool add(const void* bytes, std::size_t size) {
    return EVP_DigestUpdate(context_.get(), bytes, size) == 1;
  }
  bool finish(Digest& digest) {
    return EVP_DigestFinal_ex(context_.get(), digest.data(), nullptr) == 1;
  }

 private:
  std::unique_ptr<EVP_MD_CTX, ReleaseWith<&EVP_MD_CTX_free>> context_;
};

// The digest of a content that comes block by block. Blocks of zeros aren't fed to the MD5, but
// noted as runs of them; the MD5 of the runs follows the content. So a content gives one digest,
// and two contents of one size give two: the same runs leave the same number of bytes, in which the
// contents differ, and other runs have another MD5.
class ContentDigest {
 public:
  bool begin() {
    zeros_ = {};
    has_runs_ = false;
    return content_.begin();
  }
  // A block that isn't all zeros, or the last one, shorter than others.
  bool add(const void* bytes, std::size_t size) { return end_run() && content_.add(bytes, size); }
  // `length` zeros at `offset`; whole blocks.
  bool add_zeros(unsigned long long offset, unsigned long long length) {
    if (zeros_.length == 0) {
      zeros_.offset = offset;
    }
    zeros_.length += length;
    return true;
  }
  bool write_hex(char* digits) {
    constexpr char kDigits[] = "0123456789abcdef";
    Digest digest{};
    if (!end_run() ||
        (has_runs_ && !(runs_.finish(digest) && content_.add(digest.data(), kHexDigits / 2))) ||
        !content_.finish(digest)) {
      return false;
    }
    for (std::size_t i = 0; i < kHexDigits / 2; ++i) {
      *digits++ = kDigits[digest[i] >> 4];
      *digits++ = kDigits[digest[i] & 15];
    }
    return true;
  }

 private:
  struct Run {
    unsigned long long offset, length;  // bytes
  };

  bool end_run() {
    if (zeros_.length == 0) {
      return true;
    }
    const bool is_noted = (has_runs_ || runs_.begin()) && runs_.add(&zeros_, sizeof zeros_);
    has_runs_ = true;
    zeros_ = {};
    return is_noted;
  }

  Md5 content_;
  Md5 runs_;
  Run zeros_{};  // that may go on
  bool has_runs_ = false;
};

// The form in which a caller names what it holds: "/proc/self/fd/" and a number.
bool names_descriptor(std::string_view path) {
  constexpr std::string_view kFolder = "/proc/self/fd/";
  return path.starts_with(kFolder) && path.size() > kFolder.size() &&
         path.find_first_not_of("0123456789", kFolder.size()) == std::string_view::npos;
}

// Only the owner of a file and root may leave its access time alone.
Fd open_to_read(const char* path) {
  const int flags =
      O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC | (names_descriptor(path) ? 0 : O_NOFOLLOW);
  Fd fd(open(path, flags | O_NOATIME));
  if (!fd && errno == EPERM) {
    fd = Fd(open(path, flags));
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

Outcome failed() {
  errno = EIO;
  return kFailed;
}

// Fills `block` from `offset` on. kDigested when all of it was there.
Outcome read_block(int fd, std::byte* block, std::size_t size, unsigned long long offset) {
  for (std::size_t filled = 0; filled < size;) {
    const ssize_t got =
        pread(fd, block + filled, size - filled, static_cast<off_t>(offset + filled));
    if (got == 0) {
      return changed();
    }
    if (got < 0 && errno != EINTR) {
      return kFailed;
    }
    filled += static_cast<std::size_t>(std::max(got, ssize_t{0}));
  }
  return kDigested;
}

bool is_zero(const std::byte* block, std::size_t size) {
  return block[0] == std::byte{} && std::memcmp(block, block + 1, size - 1) == 0;
}

// How many bytes from `offset` to `size` are whole blocks in a hole. A file system that knows no
// holes has data everywhere.
unsigned long long hole_length(int fd, unsigned long long offset, unsigned long long size) {
  const off_t data = lseek(fd, static_cast<off_t>(offset), SEEK_DATA);
  if (data < 0 && errno != ENXIO) {
    return 0;
  }
  const auto end = data < 0 ? size : std::min(static_cast<unsigned long long>(data), size);
  return end > offset ? (end - offset) / kBlock * kBlock : 0;
}

// Written only while no digest is computed.
std::optional<Clock::time_point> g_deadline;
void (*g_step)(unsigned long long bytes) = nullptr;

// Reads exactly `size` bytes, so that a file that grows for ever comes to an end as well. Only a
// block of zeros raises the question how far a hole goes: a dense file is never asked.
Outcome add_content(ContentDigest& digest, int fd, unsigned long long size) {
  thread_local const auto block = std::make_unique_for_overwrite<std::byte[]>(kBlock);
  for (unsigned long long offset = 0; offset < size;) {
    if (VornQazDigestDeadlinePassed() != 0) {
      errno = ETIME;
      return kFileChanged;
    }
    const auto length =
        static_cast<std::size_t>(std::min<unsigned long long>(size - offset, kBlock));
    if (const Outcome outcome = read_block(fd, block.get(), length, offset); outcome != kDigested) {
      return outcome;
    }
    const bool is_left_out = length == kBlock && is_zero(block.get(), length);
    const unsigned long long taken =
        is_left_out ? length + hole_length(fd, offset + length, size) : length;
    if (is_left_out ? !digest.add_zeros(offset, taken) : !digest.add(block.get(), length)) {
      return failed();
    }
    offset += taken;
    if (g_step != nullptr) {
      g_step(length);
    }
  }
  return kDigested;
}

Outcome digest_file(const char* path, unsigned long long size, char* digits) {
  thread_local ContentDigest digest;
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
  if (!digest.begin()) {
    return failed();
  }
  if (const Outcome outcome = add_content(digest, fd.get(), size); outcome != kDigested) {
    return outcome;
  }
  if (fstat(fd.get(), &after) != 0) {
    return kFailed;
  }
  if (!is_version(after, size) || after.st_mtim.tv_sec != before.st_mtim.tv_sec ||
      after.st_mtim.tv_nsec != before.st_mtim.tv_nsec) {
    return changed();
  }
  return digest.write_hex(digits) ? kDigested : failed();
}

}  // namespace
}  // namespace host

void VornQazSetDigestDeadline(unsigned long long seconds) {
  constexpr unsigned long long kLongest = 1ULL << 32U;  // which no clock's count overflows by
  host::g_deadline.reset();
  if (seconds != 0) {
    host::g_deadline = host::Clock::now() + std::chrono::seconds(std::min(seconds, kLongest));
  }
}

int VornQazDigestDeadlinePassed(void) {
  return host::g_deadline && host::Clock::now() >= *host::g_deadline ? 1 : 0;
}

void VornQazSetDigestStep(void (*step)(unsigned long long bytes)) {
  host::g_step = step;
}

int VornQazGetFileMd5(const char* path, unsigned long long size, char* digest,
                      size_t digest_size) try {
  if (path == nullptr || digest == nullptr || digest_size != host::kHexDigits) {
    errno = EINVAL;
    return host::kFailed;
  }
  return host::keeping_errno([&] { return host::digest_file(path, size, digest); });
} catch (...) {
  errno = ENOMEM;
  return host::kFailed;
}
