#include "candidate.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <xxhash.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <string_view>
#include <unordered_set>
#include <vector>

#include "below_share.hpp"
#include "module.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

enum Column { kShare, kPath, kSize, kModifyTime };
constexpr size_t kLongestText = 4095;

class Descriptor {
 public:
  explicit Descriptor(int fd) : fd_(fd) {}
  ~Descriptor() {
    if (fd_ >= 0) {
      close(fd_);
    }
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  int get() const { return fd_; }

 private:
  int fd_;
};

std::string_view cut(const char* text) {
  return std::string_view(text).substr(0, kLongestText);
}

// There are few shares and many files.
const char* interned(const char* text) {
  static std::unordered_set<std::string> texts;
  return texts.emplace(cut(text)).first->c_str();
}

void log_open_failure(const dup_file_node& file) {
  if (errno == ENOENT) {
    report_trace(kDuplicateModule, __LINE__, "open file failed, file=%s,(%d)%m\n",
                 file.path.c_str(), errno);
  } else {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "open file failed, file=%s,(%d)%m",
                          file.path.c_str(), errno);
  }
}

bool is_regular(int file) {
  struct stat status {};
  if (fstat(file, &status) != 0) {
    return false;
  }
  if (!S_ISREG(status.st_mode)) {
    errno = ESTALE;  // it was when it was gathered
    return false;
  }
  return true;
}

enum class Try { kFirst, kLast };

// The sample's bytes, zeros where there are none. Read, not mapped: a file that shrinks meanwhile
// must not end the process. False, silent, at a first try when somebody holds a lease on the file,
// who gives it up within a moment.
bool read_sample(const dup_file_node& file, std::array<char, kSampleSize>& sample, Try which) {
  const uint64_t length = std::min(file.size, kSampleSize);
  const uint64_t offset = file.size <= kSampleSize ? 0 : file.size / 2 / kSampleSize * kSampleSize;
  sample.fill(0);
  // Doesn't wait for the writer of a fifo.
  const int before = errno;
  const Descriptor opened(
      open_below_share(file.share_folder, file.path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY));
  if (opened.get() < 0 && errno == EWOULDBLOCK && which == Try::kFirst) {
    errno = before;
    return false;
  }
  if (opened.get() < 0) {
    log_open_failure(file);
  } else if (!is_regular(opened.get()) ||
             pread(opened.get(), sample.data(), length, static_cast<off_t>(offset)) < 0) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__,
                          "map file failed, file=%s, nSeg=%llu, offset=%llu", file.path.c_str(),
                          static_cast<unsigned long long>(length),
                          static_cast<unsigned long long>(offset));
  }
  return true;
}

void digest_sample(dup_file_node& file, const std::array<char, kSampleSize>& sample) {
  const XXH128_hash_t digest = XXH3_128bits(sample.data(), sample.size());
  file.sample = {digest.high64, digest.low64};
}

// False, reported, when the file's digest can't be had.
bool ensure_digest(dup_file_node& file) {
  if (file.digest_done) {
    return true;
  }
  const int result =
      VornQazGetFileMd5(file.path.c_str(), file.size, file.md5.data(), file.md5.size());
  if (result == 0) {
    file.digest_done = true;
    return true;
  }
  const auto size = static_cast<unsigned long long>(file.size);
  if (result == 2) {
    report_trace(kDuplicateModule, __LINE__, "count md5 failed, file=%s, size=%llu\n",
                 file.path.c_str(), size);
  } else {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "count md5 failed, file=%s, size=%llu",
                          file.path.c_str(), size);
  }
  return false;
}

void delete_file(void* data) {
  delete static_cast<dup_file_node*>(data);
}
void keep_file(void* /*data*/) {}  // a group's members are the candidate list's

}  // namespace

int add_candidate(QAZLLNode** candidates, char* const* columns, int32_t ordinal,
                  const char* share_folder) {
  if (candidates == nullptr || columns == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    return -1;
  }
  const auto text = [&](Column column) {
    return columns[column] != nullptr ? columns[column] : "";
  };
  std::unique_ptr<dup_file_node> file(new (std::nothrow) dup_file_node{});
  if (!file) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "memory allocate failed");
    return -1;
  }
  file->share = interned(text(kShare));
  file->path = cut(text(kPath));
  file->size = std::strtoull(text(kSize), nullptr, 10);
  file->mtime = static_cast<int32_t>(std::strtoll(text(kModifyTime), nullptr, 10));
  file->ordinal = ordinal;
  file->share_folder = share_folder;
  if (QAZLLadd(candidates, file.get(), nullptr) < 0) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "add list failed");
    return -1;
  }
  static_cast<void>(file.release());
  return 0;
}

int read_fast_digests(const QAZLLNode* candidates) {
  if (candidates == nullptr || candidates->data == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    return -1;
  }
  if (file_of(candidates)->size == 0) {
    return 0;
  }
  static std::array<char, kSampleSize> sample;
  std::vector<dup_file_node*> leased;
  for (const QAZLLNode* node = candidates; node != nullptr; node = node->next) {
    dup_file_node& file = *file_of(node);
    if (read_sample(file, sample, Try::kFirst)) {
      digest_sample(file, sample);
    } else {
      leased.push_back(&file);
    }
  }
  for (dup_file_node* file : leased) {
    read_sample(*file, sample, Try::kLast);
    digest_sample(*file, sample);
  }
  return 0;
}

int compare_files(dup_file_node& a, dup_file_node& b) {
  if (a.size == 0 && b.size == 0) {
    return 0;
  }
  if (!ensure_digest(a) || !ensure_digest(b)) {
    return -1;
  }
  return a.md5 == b.md5 ? 0 : 1;
}

void release_bucket(QAZLLNode** groups, QAZLLNode** candidates) {
  QAZLLfree(groups, keep_file);
  QAZLLfree(candidates, delete_file);
}

}  // namespace vornreport
