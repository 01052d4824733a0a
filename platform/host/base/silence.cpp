#include "base/silence.hpp"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <csignal>
#include <map>

#include "vorn/base/file_io.hpp"

namespace host {
namespace {

// Only calls that are safe in the child of a process with threads.
[[noreturn]] void look_and_end(const char* path) {
  // A pipe or lock of the parent's that stayed open here would outlive it.
  syscall(SYS_close_range, 0U, UINT_MAX, 0U);
  struct stat status {};
  struct statvfs space {};
  static_cast<void>(stat(path, &status) == 0 && statvfs(path, &space) == 0 &&
                    open(path, O_RDONLY | O_DIRECTORY | O_NONBLOCK | O_CLOEXEC));
  _exit(0);
}

}  // namespace

bool looks_silent(const std::string& path, std::chrono::milliseconds limit) {
  const ErrnoKeeper keeper;
  const pid_t child = fork();
  if (child == 0) {
    look_and_end(path.c_str());
  }
  if (child < 0) {
    return false;  // whoever looks next finds out, as without this
  }
  const Fd process(static_cast<int>(syscall(SYS_pidfd_open, child, 0)));
  const auto deadline = std::chrono::steady_clock::now() + limit;
  bool has_ended = false;
  while (!has_ended) {
    const auto left =
        std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
    pollfd poller{process.get(), POLLIN, 0};
    const int ready =
        process ? poll(&poller, 1, static_cast<int>(std::max<long>(left.count(), 0))) : 1;
    if (ready == 0) {
      kill(child, SIGKILL);  // which may reach it or not
      return true;
    }
    has_ended = ready > 0;
  }
  waitpid(child, nullptr, 0);
  return false;
}

bool is_silent(const std::string& path) {
  constexpr std::chrono::seconds kLimit{15};
  static std::map<std::string, bool> known;
  const auto [entry, is_new] = known.try_emplace(path, false);
  if (is_new) {
    entry->second = looks_silent(path, kLimit);
  }
  return entry->second;
}

}  // namespace host
