// User accounts. Looked up one by one, never enumerated: domains of any size can be asked that way.
#include "machine/users.hpp"

#include <fcntl.h>
#include <pwd.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>
#include <optional>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

#include "base/formats.hpp"
#include "base/host_log.hpp"
#include "base/incident.hpp"
#include "base/text_containers.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/report.h"
#include "vorn/user.h"

namespace host {

const char* account_name_error(std::string_view name) {
  constexpr std::size_t kLongest = 255;
  if (name.empty() || name.size() > kLongest) {
    return "is not 1 to 255 bytes long";
  }
  if (std::string_view("=+-@").find(name.front()) != std::string_view::npos) {
    return "begins with one of = + - @";
  }
  if (name.find('\\') != std::string_view::npos) {
    return "holds a backslash";
  }
  if (name.find_first_of("[]:;|=*?`") != std::string_view::npos) {
    return "holds one of [ ] : ; | = * ? or a back quote";
  }
  // Reports write names as they are, so a name is harmless when escaping would change nothing.
  if (escape_js(name, '\'') != name || csv_field(name) != name) {
    return "holds a quote, '<', a control character or something else that needs escaping";
  }
  return nullptr;
}

namespace {

// The name to hand out for the name service's `name`: a domain is set off by '/'.
std::string shown_account_name(std::string name) {
  std::replace(name.begin(), name.end(), '\\', '/');
  return name;
}

struct Account {
  std::string name;  // the name service's
  uid_t uid;
  gid_t gid;
};

// Nothing: the name service knows no such account.
using Found = std::optional<Account>;

// getpwnam(3) lists these for an unknown account; all others are failures of the name service.
constexpr bool means_unknown(int error) {
  return error == 0 || error == ENOENT || error == ESRCH || error == EBADF || error == EPERM;
}

// 0, or why the file of the machine's own accounts can't be read. When it can't, the name service
// goes on to the next source, which knows nothing of them, and the answer is "unknown".
int accounts_file_error() {
  const Fd file(open("/etc/passwd", O_RDONLY | O_CLOEXEC));
  char byte = 0;
  return file && read(file.get(), &byte, 1) >= 0 ? 0 : errno;
}

void tell_failing_service(int error) {
  static bool logged = false;
  if (!std::exchange(logged, true)) {
    const std::string problem = "the name service fails (" + std::string(std::strerror(error)) +
                                "), so accounts are missing from the reports; see to the services "
                                "that the passwd line of /etc/nsswitch.conf names";
    log_line("%s", problem.c_str());
    tell_incident("users_unknown", std::strerror(error), problem);
  }
}

// `ask` is getpwnam_r or getpwuid_r without its first argument.
template <typename Ask>
Found ask_name_service(Ask ask) {
  constexpr std::size_t kLargestBuffer = std::size_t{1} << 20;
  // A source that failed for a moment reads as "unknown", too, so such an answer is asked for
  // again; but not without end, where there are hundreds of thousands of strangers.
  constexpr int kMostTries = 2;
  constexpr int kMostDoubted = 1000;
  static int doubted = 0;
  const ErrnoKeeper keeper;  // a name service probes sockets that needn't exist
  const long hint = sysconf(_SC_GETPW_R_SIZE_MAX);
  std::vector<char> buffer(hint > 0 ? static_cast<std::size_t>(hint) : 1024);
  for (int tries = 1;;) {
    passwd entry{};
    passwd* found = nullptr;
    int error = ask(&entry, buffer.data(), buffer.size(), &found);
    if (found != nullptr) {
      return Account{found->pw_name, found->pw_uid, found->pw_gid};
    }
    if (error == ERANGE && buffer.size() < kLargestBuffer) {
      buffer.resize(buffer.size() * 2);
    } else if (tries++ == kMostTries || (means_unknown(error) && ++doubted > kMostDoubted)) {
      if (means_unknown(error)) {
        error = doubted < kMostDoubted ? accounts_file_error() : 0;
      }
      if (error != 0) {
        tell_failing_service(error);
      }
      return std::nullopt;
    }
  }
}

Found ask_for_name(const std::string& name) {
  return ask_name_service([&](passwd* entry, char* buffer, std::size_t size, passwd** found) {
    return getpwnam_r(name.c_str(), entry, buffer, size, found);
  });
}

// A report asks for every row, an index import for every file, and one round trip to a domain takes
// a millisecond. The unknown is kept as well.
using ByName = std::unordered_map<std::string, Found, KeyHash, KeyEqual>;

ByName& known_names() {
  static ByName known;
  return known;
}

const Found& account_named(std::string_view name) {
  ByName& known = known_names();
  auto entry = known.find(name);
  if (entry == known.end()) {
    std::string key(name);
    Found account = ask_for_name(key);
    if (!account && key.find('/') != std::string::npos) {
      std::string native = key;
      std::replace(native.begin(), native.end(), '/', '\\');
      account = ask_for_name(native);
    }
    entry = known.emplace(std::move(key), std::move(account)).first;
  }
  return entry->second;
}

const Found& account_of(uid_t uid) {
  static std::unordered_map<uid_t, Found> known;
  auto entry = known.find(uid);
  if (entry == known.end()) {
    Found account =
        ask_name_service([&](passwd* found, char* buffer, std::size_t size, passwd** result) {
          return getpwuid_r(uid, found, buffer, size, result);
        });
    if (account) {
      // Who sees this name looks it up next; a service may know the one and not the other.
      Found& by_name = known_names()[shown_account_name(account->name)];
      by_name = by_name ? by_name : account;
    }
    entry = known.emplace(uid, std::move(account)).first;
  }
  return entry->second;
}

// Whether the name of an account that exists can be written to reports; logs once when it can't.
bool can_be_shown(std::string_view name) {
  const char* error = account_name_error(name);
  if (error == nullptr) {
    return true;
  }
  static std::unordered_set<std::string> logged;
  if (!logged.emplace(name).second) {
    return false;
  }
  const int length = static_cast<int>(std::min<std::size_t>(name.size(), 300));
  if (name.find('\\') != std::string_view::npos) {
    log_line(
        "account \"%.*s\" is left out: write it with '/' in vornreport.conf; the quota report "
        "shows it when smb.conf has another \"winbind separator\" than the backslash",
        length, name.data());
  } else {
    log_line("account \"%.*s\" is left out of the reports: its name %s; rename the account", length,
             name.data(), error);
  }
  return false;
}

// What a caller holds as a VORNUser, with the text of its name.
struct Record : VORNUser {
  Record(std::string shown, const Account& account) : text(std::move(shown)) {
    name = text.data();
    uid = account.uid;
    gid = account.gid;
  }
  std::string text;
};

int hand_out(const Found& account, const std::string& shown, VORNUser** user) {
  if (!account || !can_be_shown(shown)) {
    errno = ENOENT;
    return -1;
  }
  *user = std::make_unique<Record>(shown, *account).release();
  return 0;
}

}  // namespace
}  // namespace host

int VORNUserGet(const char* name, VORNUser** user) try {
  if (user != nullptr) {
    *user = nullptr;
  }
  if (name == nullptr || *name == '\0' || user == nullptr) {
    errno = EINVAL;
    return -1;
  }
  return host::hand_out(host::account_named(name), name, user);
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VORNUserGetByUID(uid_t uid, VORNUser** user) try {
  if (user == nullptr) {
    errno = EINVAL;
    return -1;
  }
  *user = nullptr;
  const host::Found& account = host::account_of(uid);
  return host::hand_out(account, account ? host::shown_account_name(account->name) : "", user);
} catch (...) {
  errno = ENOMEM;
  return -1;
}

void VORNUserFree(VORNUser* user) {
  delete static_cast<host::Record*>(user);
}

int VORNUserGetUGID(const char* name, uid_t* uid, gid_t* gid) try {
  if (name == nullptr || *name == '\0' || uid == nullptr) {
    errno = EINVAL;
    return -1;
  }
  const host::Found& account = host::account_named(name);
  if (!account) {
    errno = ENOENT;
    return -1;
  }
  *uid = account->uid;
  if (gid != nullptr) {
    *gid = account->gid;
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
    return !name.empty() && host::account_named(name) && host::can_be_shown(name)
               ? std::optional<std::string>(name)
               : std::nullopt;
  });
  *hash = filter.release();
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}
