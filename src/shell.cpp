#include "shell.hpp"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <memory>
#include <string>

#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

using Clock = std::chrono::steady_clock;

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

// Standard output of a command: a descriptor, or this process's own.
constexpr int kInherited = -1;

// The child gets a process group of its own, so that one kill reaches all that it starts, and the
// signal settings that a shell expects. 0 or an errno value.
int spawn_shell(const char* command, int output, const sigset_t* mask, pid_t* child) {
  posix_spawnattr_t attributes;
  posix_spawn_file_actions_t files;
  posix_spawnattr_init(&attributes);  // neither can fail on Linux
  posix_spawn_file_actions_init(&files);
  sigset_t defaults;
  sigemptyset(&defaults);
  sigaddset(&defaults, SIGTERM);
  sigaddset(&defaults, SIGPIPE);
  sigaddset(&defaults, SIGXFSZ);
  posix_spawnattr_setflags(&attributes,
                           POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
  posix_spawnattr_setpgroup(&attributes, 0);
  posix_spawnattr_setsigmask(&attributes, mask);
  posix_spawnattr_setsigdefault(&attributes, &defaults);
  int error = 0;
  if (output != kInherited) {
    error = posix_spawn_file_actions_adddup2(&files, output, STDOUT_FILENO);
  }
  if (error == 0) {
    const char* const argv[] = {"sh", "-c", command, nullptr};
    error =
        posix_spawn(child, "/bin/sh", &files, &attributes, const_cast<char* const*>(argv), environ);
  }
  posix_spawn_file_actions_destroy(&files);
  posix_spawnattr_destroy(&attributes);
  return error;
}

// Starts a command as the one that SIGTERM ends. Its process id, or -1, logged.
pid_t start_command(const char* module, const char* command, int output) {
  std::fflush(nullptr);
  pid_t child = 0;
  int error = 0;
  {
    const SigtermBlocked blocked;
    error = spawn_shell(command, output, blocked.mask_before(), &child);
    if (error == 0) {
      g_command_group = child;
      return child;
    }
  }
  // Not with SIGTERM blocked: a full log that nobody reads would keep both waiting for ever.
  const int before = errno;
  errno = error;
  REPORT_LOG_ERR(module, __LINE__, "cannot start /bin/sh, cmd=%s\n", command);
  errno = before;
  return -1;
}

// Waits for the end of a started command. Its exit status as the shell gives it.
int await_command(pid_t child) {
  const int before = errno;
  // It stays a zombie until the group is forgotten, so that its number can't be reused before.
  siginfo_t ended{};
  while (waitid(P_PID, static_cast<id_t>(child), &ended, WEXITED | WNOWAIT) != 0 &&
         errno == EINTR) {
  }
  g_command_group = 0;
  int status = 0;
  waitpid(child, &status, 0);
  errno = before;
  constexpr int kSignalled = 128;
  return WIFEXITED(status) ? WEXITSTATUS(status) : kSignalled + WTERMSIG(status);
}

// A descriptor that is readable once the process has ended. (glibc 2.36 declares its wrapper for C
// only.)
int open_process(pid_t process) {
  return static_cast<int>(syscall(SYS_pidfd_open, process, 0));
}

int milliseconds_until(Clock::time_point deadline) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
  return static_cast<int>(std::clamp<decltype(left)>(left, 0, 1 << 30));
}

// True when `fd` has something to say before the deadline.
bool wait_for(int fd, Clock::time_point deadline) {
  pollfd poller{fd, POLLIN, 0};
  int ready = 0;
  while ((ready = poll(&poller, 1, milliseconds_until(deadline))) < 0 && errno == EINTR) {
  }
  return ready > 0;
}

// A command whose output is being read; the cookie of a stream.
struct ReadCommand {
  const char* module;
  std::string command;
  pid_t child = 0;
  int fd = -1;
  Clock::time_point deadline;
  uint64_t bytes_left = 0;
  bool ended = false;

  void end_early(const char* reason) {
    REPORT_LOG_ERR(module, __LINE__, "%s, ended cmd=%s\n", reason, command.c_str());
    kill(-child, SIGKILL);
    ended = true;
  }

  ssize_t read_some(char* buffer, size_t size) {
    if (ended) {
      return 0;
    }
    if (!wait_for(fd, deadline)) {
      end_early("command took too long");
      return 0;
    }
    const ssize_t got = read(fd, buffer, std::min<uint64_t>(size, bytes_left + 1));
    if (got > 0 && static_cast<uint64_t>(got) > bytes_left) {
      end_early("command printed too much");
      return 0;
    }
    bytes_left -= static_cast<uint64_t>(std::max<ssize_t>(got, 0));
    return got;
  }

  // Returns when the command has ended, by itself or at its deadline: its exit status, or -1 when
  // it was ended at a limit.
  int finish() {
    close(fd);
    const int process = open_process(child);
    if (!ended && process >= 0 && !wait_for(process, deadline)) {
      end_early("command took too long");
    }
    if (process >= 0) {
      close(process);
    }
    const int status = await_command(child);
    return ended ? -1 : status;
  }
};

// Null, logged, when the command could not be started.
std::unique_ptr<ReadCommand> start_reading(const char* module, const char* command,
                                           const CommandLimits& limits) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) {
    REPORT_LOG_ERR(module, __LINE__, "cannot make a pipe, cmd=%s\n", command);
    return nullptr;
  }
  const pid_t child = start_command(module, command, ends[1]);
  close(ends[1]);
  if (child < 0) {
    close(ends[0]);
    return nullptr;
  }
  auto started = std::make_unique<ReadCommand>();
  started->module = module;
  started->command = command;
  started->child = child;
  started->fd = ends[0];
  started->deadline = Clock::now() + std::chrono::seconds(limits.seconds);
  started->bytes_left = limits.bytes;
  return started;
}

ssize_t read_cookie(void* cookie, char* buffer, size_t size) {
  return static_cast<ReadCommand*>(cookie)->read_some(buffer, size);
}

int close_cookie(void* cookie) {
  const std::unique_ptr<ReadCommand> command(static_cast<ReadCommand*>(cookie));
  return command->finish() == -1 ? EOF : 0;
}

}  // namespace

void run_command(const char* module, int line, const char* format, ...) {
  CommandText command;
  va_list args;
  va_start(args, format);
  // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): it is, one line above
  std::vsnprintf(command.data(), CommandText::size(), format, args);
  va_end(args);
  report_trace(module, line, "run cmd=%s\n\n", command.c_str());
  const pid_t child = start_command(module, command.c_str(), kInherited);
  if (child < 0 || await_command(child) != 0) {
    mark_report_data_lost();
  }
}

int run_limited(const char* module, const char* command, const CommandLimits& limits) {
  const std::unique_ptr<ReadCommand> running = start_reading(module, command, limits);
  if (!running) {
    return -1;
  }
  std::array<char, 65536> unread{};
  while (running->read_some(unread.data(), unread.size()) > 0) {
  }
  return running->finish();
}

FileHandle open_limited(const char* module, const char* command, const CommandLimits& limits) {
  std::unique_ptr<ReadCommand> running = start_reading(module, command, limits);
  if (!running) {
    return nullptr;
  }
  const cookie_io_functions_t functions{read_cookie, nullptr, nullptr, close_cookie};
  FileHandle stream(fopencookie(running.get(), "r", functions));
  if (!stream) {
    running->end_early("no memory to read a command");
    running->finish();
    return nullptr;
  }
  static_cast<void>(running.release());
  return stream;
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
