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
#include "compare_limit.hpp"
#include "module.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

enum Column { kShare, kPath, kSize, kModifyTime };
constexpr size_t kLongestText = 4095;

constexpr int kDigestChanged = 2;  // as VornQazGetFileMd5 says it

std::string_view cut(const char* text) {
  return std::string_view(text).substr(0, kLongestText);
}

// What is left alone by threads that look ahead, and by who does so itself.
class ErrnoKept {
 public:
  ErrnoKept() = default;
  ~ErrnoKept() { errno = before_; }
  ErrnoKept(const ErrnoKept&) = delete;
  ErrnoKept& operator=(const ErrnoKept&) = delete;

 private:
  const int before_ = errno;
};

uint64_t sample_length(const dup_file_node& file) {
  return std::min(file.size, kSampleSize);
}
uint64_t sample_offset(const dup_file_node& file) {
  return file.size <= kSampleSize ? 0 : file.size / 2 / kSampleSize * kSampleSize;
}

// There are few shares and many files.
const char* interned(const char* text) {
  static std::unordered_set<std::string> texts;
  return texts.emplace(cut(text)).first->c_str();
}

// Lines for a sample that couldn't be read.
void tell_sample(const dup_file_node& file) {
  errno = file.failure.error;
  if (file.sample_state == SampleState::kNotMapped) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__,
                          "map file failed, file=%s, nSeg=%llu, offset=%llu", file.path.c_str(),
                          static_cast<unsigned long long>(sample_length(file)),
                          static_cast<unsigned long long>(sample_offset(file)));
  } else if (errno == ENOENT) {
    report_trace(kDuplicateModule, __LINE__, "open file failed, file=%s,(%d)%m\n",
                 file.path.c_str(), errno);
  } else {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "open file failed, file=%s,(%d)%m",
                          file.path.c_str(), errno);
  }
}

// A path that leads to what `handle` names, wherever that stands by now.
std::string path_of(const Descriptor& handle) {
  return "/proc/self/fd/" + std::to_string(handle.get());
}

// False, with errno, for anything else: it was one when it was gathered.
bool is_regular_file(const Descriptor& handle, struct stat& status) {
  if (fstat(handle.get(), &status) != 0) {
    return false;
  }
  errno = S_ISREG(status.st_mode) ? errno : S_ISLNK(status.st_mode) ? ELOOP : ESTALE;
  return S_ISREG(status.st_mode);
}

// Opens what `handle` names for reading, its access time left alone where the system lets us.
// Doesn't wait for who holds a lease.
Descriptor open_content(const Descriptor& handle) {
  constexpr int kFlags = O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
  const std::string path = path_of(handle);
  Descriptor opened(open(path.c_str(), kFlags | O_NOATIME));
  if (!opened && errno == EPERM) {
    opened = Descriptor(open(path.c_str(), kFlags));
  }
  return opened;
}

using SampleBytes = std::array<char, kSampleSize>;

// Fills `sample` with the file's bytes and notes in `file` which file that was. Read, not mapped: a
// file that shrinks meanwhile must not end the process. Whatever fails leaves zeros, and errno.
SampleState read_sample(dup_file_node& file, SampleBytes& sample) {
  sample.fill(0);
  const Descriptor handle = open_below_share(file.share_folder, file.path.c_str());
  struct stat status {};
  const bool is_regular = handle && is_regular_file(handle, status);
  const Descriptor opened = is_regular ? open_content(handle) : Descriptor();
  if (is_regular && !opened && errno == EWOULDBLOCK && file.sample_state == SampleState::kUnread) {
    return SampleState::kLeased;
  }
  if (!handle || S_ISLNK(status.st_mode) || (is_regular && !opened)) {
    return SampleState::kNotOpened;
  }
  if (!opened || pread(opened.get(), sample.data(), sample_length(file),
                       static_cast<off_t>(sample_offset(file))) < 0) {
    return SampleState::kNotMapped;
  }
  file.device = status.st_dev;
  file.inode = status.st_ino;
  return SampleState::kRead;
}

// Whether an error says that users moved, replaced or closed something since.
constexpr bool means_changed(int error) {
  return error == ENOENT || error == ENOTDIR || error == ELOOP || error == EXDEV ||
         error == EACCES || error == ESTALE;
}

// As VornQazGetFileMd5, of the very file that the sample was read from.
int ask_digest(dup_file_node& file) {
  const Descriptor handle = open_below_share(file.share_folder, file.path.c_str());
  struct stat status {};
  if (!handle || !is_regular_file(handle, status)) {
    return means_changed(errno) ? kDigestChanged : -1;
  }
  if (status.st_dev != file.device || status.st_ino != file.inode) {
    errno = ESTALE;
    return kDigestChanged;
  }
  return VornQazGetFileMd5(path_of(handle).c_str(), file.size, file.md5.data(), file.md5.size());
}

// False, reported each time, when the file's digest can't be had.
bool ensure_digest(dup_file_node& file) {
  if (file.digest_done) {
    return true;
  }
  if (file.failure.result == 0 && !file.is_ahead) {
    compute_digest_ahead(file);
  }
  const bool is_new = std::exchange(file.is_ahead, false);
  if (is_new && file.failure.result == 0) {
    file.digest_done = true;
    return true;
  }
  if (is_new && file.failure.error == 0) {
    file.failure.error = errno;  // the platform didn't say
  }
  const DigestFailure failure = file.failure;
  // Who holds a lease gives it up: the next pair may have more luck.
  if (is_new && failure.error == EWOULDBLOCK) {
    file.failure = {};
  }
  errno = failure.error;
  const auto size = static_cast<unsigned long long>(file.size);
  if (failure.result == kDigestChanged) {
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

void read_sample_ahead(dup_file_node& file) {
  thread_local SampleBytes bytes;
  const ErrnoKept kept;
  file.sample_state = read_sample(file, bytes);
  if (file.sample_state == SampleState::kLeased) {
    return;
  }
  if (file.sample_state != SampleState::kRead) {
    file.failure = {kDigestChanged, errno};  // what it may be now isn't for us to read
  }
  const XXH128_hash_t digest = XXH3_128bits(bytes.data(), bytes.size());
  file.sample = {digest.high64, digest.low64};
}

void compute_digest_ahead(dup_file_node& file) {
  const ErrnoKept kept;
  errno = 0;
  const int result = ask_digest(file);
  file.failure = {result, result == 0 ? 0 : errno};
  file.is_ahead = true;
}

int read_fast_digests(const QAZLLNode* candidates) {
  if (candidates == nullptr || candidates->data == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    return -1;
  }
  if (file_of(candidates)->size == 0) {
    return 0;
  }
  const auto settle = [](dup_file_node& file, SampleState open_question) {
    if (file.sample_state == open_question) {
      read_sample_ahead(file);
    }
    if (file.sample_state > SampleState::kRead) {
      tell_sample(file);
    }
  };
  std::vector<dup_file_node*> leased;
  for (const QAZLLNode* node = candidates; node != nullptr; node = node->next) {
    if (past_compare_limit(file_of(node)->size)) {
      return 0;
    }
    settle(*file_of(node), SampleState::kUnread);
    if (file_of(node)->sample_state == SampleState::kLeased) {
      leased.push_back(file_of(node));
    }
  }
  for (dup_file_node* file : leased) {
    settle(*file, SampleState::kLeased);
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
