#include "base/trusted_folder.hpp"

#include <fcntl.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <climits>
#include <cstring>
#include <deque>
#include <optional>
#include <string_view>

namespace host {
namespace {

constexpr mode_t kOwnFolder = 0750;
constexpr int kMostLinks = 40;  // as the kernel's own look-ups

// The owner that stands for all those that this user namespace doesn't know, among them the
// machine's root; none outside of namespaces.
std::optional<uid_t> unknown_owner() {
  constexpr std::string_view kAll = "4294967295";
  const auto map = read_file("/proc/self/uid_map", 4096);
  if (!map || map->find(kAll) != std::string::npos) {
    return std::nullopt;
  }
  const auto overflow = read_file("/proc/sys/kernel/overflowuid", 64);
  uid_t uid = 0;
  return overflow &&
                 std::from_chars(overflow->data(), overflow->data() + overflow->size(), uid).ec ==
                     std::errc()
             ? std::optional(uid)
             : std::nullopt;
}

bool is_roots(const struct stat& status) {
  static const std::optional<uid_t> unknown = unknown_owner();
  return status.st_uid == 0 || status.st_uid == geteuid() || status.st_uid == unknown;
}

std::deque<std::string> components(std::string_view path) {
  std::deque<std::string> names;
  while (!path.empty()) {
    const std::size_t end = std::min(path.find('/'), path.size());
    if (const std::string_view name = path.substr(0, end); !name.empty() && name != ".") {
      names.emplace_back(name);
    }
    path.remove_prefix(std::min(end + 1, path.size()));
  }
  return names;
}

// A path looked up name by name.
class LookUp {
 public:
  LookUp(const std::string& path, Missing missing, Strangers strangers)
      : left_(components(path)), missing_(missing), strangers_(strangers) {}

  TrustedFolder open() {
    if (!enter(Fd(::open("/", O_PATH | O_DIRECTORY | O_CLOEXEC)), "/")) {
      return failed();
    }
    while (!left_.empty()) {
      const std::string name = std::move(left_.front());
      left_.pop_front();
      if (!step(name)) {
        return failed();
      }
    }
    Fd folder(openat(at_.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!folder) {
      refuse(shown_ + " can't be read", "see to it");
      return failed();
    }
    return TrustedFolder{std::move(folder), ""};
  }

 private:
  bool step(const std::string& name) {
    const std::string shown = (shown_ == "/" ? "" : shown_) + "/" + name;
    Fd found(openat(at_.get(), name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
    if (!found && errno == ENOENT && missing_ == Missing::made) {
      if (mkdirat(at_.get(), name.c_str(), kOwnFolder) != 0 && errno != EEXIST) {
        return refuse(shown + " can't be made", "make it, or the folder above it writable");
      }
      found = Fd(openat(at_.get(), name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
    }
    struct stat status {};
    if (!found || fstat(found.get(), &status) != 0) {
      return errno != ENOENT && refuse(shown + " can't be used", "see to it");
    }
    return S_ISLNK(status.st_mode) ? follow(found, status, shown) : enter(std::move(found), shown);
  }

  bool follow(const Fd& link, const struct stat& status, const std::string& shown) {
    std::array<char, PATH_MAX> target{};
    const ssize_t length = readlinkat(link.get(), "", target.data(), target.size());
    if (length <= 0 || static_cast<std::size_t>(length) == target.size() || ++links_ > kMostLinks) {
      errno = length < 0 ? errno : ELOOP;
      return refuse(shown + " can't be followed", "remove the link");
    }
    if (left_.empty() || !is_roots(status) || has_strangers_) {
      errno = left_.empty() ? ELOOP : EPERM;
      return refuse(shown + " is a link", "move it away");
    }
    const std::string_view text(target.data(), static_cast<std::size_t>(length));
    std::deque<std::string> names = components(text);
    left_.insert(left_.begin(), names.begin(), names.end());
    return text.front() != '/' || enter(Fd(::open("/", O_PATH | O_DIRECTORY | O_CLOEXEC)), "/");
  }

  bool enter(Fd folder, const std::string& shown) {
    struct stat status {};
    if (!folder || fstat(folder.get(), &status) != 0) {
      return refuse(shown + " can't be used", "see to it");
    }
    if (!S_ISDIR(status.st_mode)) {
      errno = ENOTDIR;
      return refuse(shown + " is no folder", "move it away");
    }
    const bool is_sticky = (status.st_mode & S_ISVTX) != 0 && !left_.empty();
    const bool is_shared = (status.st_mode & (S_IWGRP | S_IWOTH)) != 0 && !is_sticky;
    if (strangers_ == Strangers::not_followed) {
      has_strangers_ = has_strangers_ || !is_roots(status) || is_shared;
    } else if (!is_roots(status)) {
      errno = EPERM;
      return refuse(shown + " belongs to another user (number " + std::to_string(status.st_uid) +
                        "), who could lead root astray",
                    "run chown root '" + shown + "', or choose another folder");
    } else if (is_shared) {
      errno = EPERM;
      return refuse(shown + " is writable by others, who could lead root astray",
                    "run chmod go-w '" + shown + "', or choose another folder");
    }
    at_ = std::move(folder);
    shown_ = shown;
    return true;
  }

  bool refuse(const std::string& what, const std::string& remedy) {
    problem_ = what;
    if (errno != EPERM || what.ends_with("made")) {
      problem_ += std::string(" (") + std::strerror(errno) + ")";
    }
    problem_ += "; " + (errno == EACCES ? "run this as root" : remedy);
    return false;
  }

  TrustedFolder failed() { return {Fd(), std::move(problem_)}; }

  std::deque<std::string> left_;
  Missing missing_;
  Strangers strangers_;
  bool has_strangers_ = false;  // on the way so far
  Fd at_;
  std::string shown_;
  int links_ = 0;
  std::string problem_;
};

}  // namespace

TrustedFolder open_trusted(const std::string& path, Missing missing, Strangers strangers) {
  return LookUp(path, missing, strangers).open();
}

}  // namespace host
