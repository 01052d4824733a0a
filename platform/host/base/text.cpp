// Text containers, shell quoting and the error code.
#include "vorn/text.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <exception>

#include "base/text_containers.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"

namespace {

struct LastError {
  int code = 0;
  const char* file = "";  // this and the line are for whoever attaches a debugger
  int line = 0;
};

LastError last_error;

constexpr unsigned char folded(char c) {
  const auto byte = static_cast<unsigned char>(c);
  return byte >= 'A' && byte <= 'Z' ? static_cast<unsigned char>(byte + ('a' - 'A')) : byte;
}

// Runs `work`; out of memory, the only failure there is, becomes `failure`.
template <typename Result, typename Work>
Result guarded(Result failure, Work work) noexcept {
  try {
    return work();
  } catch (const std::exception&) {
    errno = ENOMEM;
    return failure;
  }
}

}  // namespace

namespace host {

std::size_t KeyHash::operator()(std::string_view key) const noexcept {
  if (key_case == KeyCase::exact) {
    return std::hash<std::string_view>{}(key);
  }
  std::size_t hash = 0xcbf29ce484222325U;  // FNV-1a; folded keys are short
  for (const char c : key) {
    hash = (hash ^ folded(c)) * 0x100000001b3U;
  }
  return hash;
}

bool KeyEqual::operator()(std::string_view a, std::string_view b) const noexcept {
  if (key_case == KeyCase::exact) {
    return a == b;
  }
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](char x, char y) { return folded(x) == folded(y); });
}

}  // namespace host

const char* VLIBCSzHash::find(std::string_view key) const {
  auto entry = entries_.find(key);
  if (entry == entries_.end()) {
    if (!resolver_) {
      return nullptr;
    }
    entry = entries_.emplace(key, resolver_(key)).first;
  }
  return entry->second ? entry->second->c_str() : nullptr;
}

void VLIBCSzHash::set(std::string_view key, std::string_view value) {
  if (const auto entry = entries_.find(key); entry != entries_.end()) {
    entry->second = std::string(value);
  } else {
    entries_.emplace(key, std::string(value));
  }
}

void VLIBCSzHash::remove(std::string_view key) {
  if (const auto entry = entries_.find(key); entry != entries_.end()) {
    entries_.erase(entry);
  }
}

std::vector<VLIBCSzHash::Entry> VLIBCSzHash::sorted() const {
  std::vector<Entry> result;
  result.reserve(entries_.size());
  for (const auto& [key, value] : entries_) {
    if (value) {
      result.emplace_back(key, *value);
    }
  }
  std::sort(result.begin(), result.end());
  return result;
}

void VLIBCSzHash::fold_case() {
  Map folded_entries(std::max<std::size_t>(entries_.bucket_count(), 1),
                     host::KeyHash{host::KeyCase::ascii_folded},
                     host::KeyEqual{host::KeyCase::ascii_folded});
  for (const auto& [key, value] : sorted()) {
    folded_entries.emplace(key, std::string(value));
  }
  entries_ = std::move(folded_entries);
}

VLIBCSzHash* VLIBCSzHashAlloc(size_t slots) {
  return guarded<VLIBCSzHash*>(nullptr, [slots] { return new VLIBCSzHash(slots); });
}

void VLIBCSzHashFree(VLIBCSzHash* hash) {
  delete hash;
}

const char* VLIBCSzHashGetValue(const VLIBCSzHash* hash, const char* key) {
  if (hash == nullptr || key == nullptr) {
    return nullptr;
  }
  return guarded<const char*>(nullptr, [=] { return hash->find(key); });
}

int VLIBCSzHashSetValue(VLIBCSzHash** hash, const char* key, const char* value) {
  if (hash == nullptr || *hash == nullptr || key == nullptr || value == nullptr) {
    return -1;
  }
  return guarded(-1, [=] {
    (*hash)->set(key, value);
    return 0;
  });
}

VLIBCSzList* VLIBCSzListAlloc([[maybe_unused]] size_t slots) {
  return guarded<VLIBCSzList*>(nullptr, [] { return new VLIBCSzList; });
}

void VLIBCSzListFree(VLIBCSzList* list) {
  delete list;
}

int VLIBCSzListPush(VLIBCSzList** list, const char* text) {
  if (list == nullptr || *list == nullptr || text == nullptr) {
    return -1;
  }
  return guarded(-1, [=] {
    (*list)->texts.emplace_back(text);
    return 0;
  });
}

int VLIBCSzListCount(const VLIBCSzList* list) {
  return list == nullptr ? 0 : static_cast<int>(list->texts.size());
}

const char* VLIBCSzListGet(const VLIBCSzList* list, int index) {
  if (index < 0 || index >= VLIBCSzListCount(list)) {
    return nullptr;
  }
  return list->texts[static_cast<std::size_t>(index)].c_str();
}

int VLIBCStrTok(const char* text, const char* separators, VLIBCSzList** list) {
  if (text == nullptr || separators == nullptr || list == nullptr || *list == nullptr) {
    errno = EINVAL;
    return -1;
  }
  return guarded(-1, [=] {
    std::string_view rest = text;
    if (host::trimmed(rest).empty()) {
      return 0;
    }
    for (int pieces = 1;; ++pieces) {
      const std::size_t end = rest.find_first_of(separators);
      (*list)->texts.emplace_back(host::trimmed(rest.substr(0, end)));
      if (end == std::string_view::npos) {
        return pieces;
      }
      rest.remove_prefix(end + 1);
    }
  });
}

int VLIBCEncShParam(const char* text, char* out, size_t size) {
  if (out == nullptr || size == 0) {
    return -1;
  }
  *out = '\0';
  if (text == nullptr) {
    return -1;
  }
  return guarded(-1, [=] {
    std::string quoted = "'";
    for (const char* c = text; *c != '\0'; ++c) {
      if (*c == '\'') {
        quoted += R"('\'')";
      } else {
        quoted += *c;
      }
    }
    quoted += '\'';
    if (quoted.size() >= size) {
      return -1;
    }
    std::memcpy(out, quoted.c_str(), quoted.size() + 1);
    return static_cast<int>(quoted.size());
  });
}

int VLIBCFileTouch(const char* path) {
  if (path == nullptr) {
    errno = EINVAL;
    return -1;
  }
  const int saved_errno = errno;
  const host::Fd made(open(path, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!made) {
    struct stat status {};
    if (errno != EEXIST || lstat(path, &status) != 0) {
      return -1;
    }
    if (!S_ISREG(status.st_mode)) {
      errno = S_ISLNK(status.st_mode) ? ELOOP : EEXIST;
      return -1;
    }
  }
  errno = saved_errno;
  return 0;
}

int VLIBCErrGet(void) {
  return last_error.code;
}

void VLIBCErrSetEx(int code, const char* file, int line) {
  last_error = {code, file, line};
}
