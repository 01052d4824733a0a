// User accounts. Only look-ups by name: domains of any size can be asked, not all enumerated.
#include <pwd.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "file_io.hpp"
#include "text_containers.hpp"
#include "vorn/report.h"
#include "vorn/user.h"

namespace {

struct Ids {
  uid_t user;
  gid_t group;
};

std::optional<Ids> ask_name_service(const std::string& name) {
  constexpr std::size_t kLargestBuffer = std::size_t{1} << 20;
  const long hint = sysconf(_SC_GETPW_R_SIZE_MAX);
  std::vector<char> buffer(hint > 0 ? static_cast<std::size_t>(hint) : 1024);
  for (;;) {
    passwd account{};
    passwd* found = nullptr;
    const int error = getpwnam_r(name.c_str(), &account, buffer.data(), buffer.size(), &found);
    if (error == ERANGE && buffer.size() < kLargestBuffer) {
      buffer.resize(buffer.size() * 2);
    } else if (error != EINTR) {
      return found == nullptr ? std::nullopt : std::optional(Ids{found->pw_uid, found->pw_gid});
    }
  }
}

// An index import asks for every file's owner, and one LDAP round trip takes a millisecond.
std::optional<Ids> ids_of(std::string_view name) {
  static std::unordered_map<std::string, std::optional<Ids>, host::KeyHash, host::KeyEqual> known;
  auto entry = known.find(name);
  if (entry == known.end()) {
    const host::ErrnoKeeper keeper;  // a name service probes sockets that needn't exist
    std::string key(name);
    const std::optional<Ids> ids = ask_name_service(key);
    entry = known.emplace(std::move(key), ids).first;
  }
  return entry->second;
}

}  // namespace

int VORNUserGetUGID(const char* name, uid_t* uid, gid_t* gid) try {
  if (name == nullptr || *name == '\0' || uid == nullptr) {
    errno = EINVAL;
    return -1;
  }
  const std::optional<Ids> ids = ids_of(name);
  if (!ids) {
    errno = ENOENT;
    return -1;
  }
  *uid = ids->user;
  if (gid != nullptr) {
    *gid = ids->group;
  }
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazInitFilterUser(VLIBCSzHash** hash) try {
  if (hash == nullptr) {
    errno = EINVAL;
    return -1;
  }
  *hash = nullptr;
  auto filter = std::make_unique<VLIBCSzHash>(0);
  filter->resolve_with([](std::string_view name) -> std::optional<std::string> {
    return ids_of(name) ? std::optional<std::string>(name) : std::nullopt;
  });
  *hash = filter.release();
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}
