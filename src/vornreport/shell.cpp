#include "shell.hpp"

#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>

#include "module.hpp"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"

namespace vornreport {
namespace {

// The process group of the running command, 0 when there is none. Written with SIGTERM blocked or
// while the group can't be reused, so the handler never signals a stranger.
volatile sig_atomic_t g_command_group = 0;

class SigtermBlocked {
 public:
  SigtermBlocked() {
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGTERM);
    sigprocmask(SIG_BLOCK, &set, &before_);
  }
  ~SigtermBlocked() { sigprocmask(SIG_SETMASK, &before_, nullptr); }
  SigtermBlocked(const SigtermBlocked&) = delete;
  SigtermBlocked& operator=(const SigtermBlocked&) = delete;
  const sigset_t* mask_before() const { return &before_; }

 private:
  sigset_t before_{};
};

// The child gets a process group of its own, so that one kill reaches all that it starts, and the
// signal settings that a shell expects. 0 or an errno value.
int spawn_shell(const char* command, const sigset_t* mask, pid_t* child) {
  posix_spawnattr_t attributes;
  if (const int error = posix_spawnattr_init(&attributes); error != 0) {
    return error;
  }
  sigset_t defaults;
  sigemptyset(&defaults);
  sigaddset(&defaults, SIGTERM);
  sigaddset(&defaults, SIGPIPE);
  posix_spawnattr_setflags(&attributes,
                           POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
  posix_spawnattr_setpgroup(&attributes, 0);
  posix_spawnattr_setsigmask(&attributes, mask);
  posix_spawnattr_setsigdefault(&attributes, &defaults);
  const char* const argv[] = {"sh", "-c", command, nullptr};
  const int error =
      posix_spawn(child, "/bin/sh", nullptr, &attributes, const_cast<char* const*>(argv), environ);
  posix_spawnattr_destroy(&attributes);
  return error;
}

// As system(3), whose child could not be ended from a signal handler.
void run_shell(const char* command) {
  const int error_before = errno;
  pid_t child = 0;
  {
    const SigtermBlocked blocked;
    if (const int error = spawn_shell(command, blocked.mask_before(), &child); error != 0) {
      errno = error;
      REPORT_LOG_ERR(kDriverModule, __LINE__, "cannot start /bin/sh, cmd=%s\n", command);
      errno = error_before;
      return;
    }
    g_command_group = child;
  }
  // The child stays a zombie until the group is forgotten, so its number can't be reused before.
  siginfo_t ended{};
  while (waitid(P_PID, static_cast<id_t>(child), &ended, WEXITED | WNOWAIT) != 0 &&
         errno == EINTR) {
  }
  g_command_group = 0;
  waitpid(child, nullptr, 0);
  errno = error_before;
}

}  // namespace

void run_command(int line, const char* format, ...) {
  CommandText command;
  va_list args;
  va_start(args, format);
  std::vsnprintf(command.data(), CommandText::size(), format, args);
  va_end(args);
  report_trace(kDriverModule, line, "run cmd=%s\n\n", command.c_str());
  std::fflush(nullptr);
  run_shell(command.c_str());
}

void end_running_command() {
  const auto group = static_cast<pid_t>(g_command_group);
  if (group == 0) {
    return;
  }
  // SIGKILL: a command that lived on could write to the files that are about to be removed.
  kill(-group, SIGKILL);
  constexpr int kRounds = 50;
  constexpr int kRoundMs = 10;
  for (int round = 0; round < kRounds && waitpid(group, nullptr, WNOHANG) == 0; ++round) {
    poll(nullptr, 0, kRoundMs);
  }
}

}  // namespace vornreport
