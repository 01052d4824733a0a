#include "base/child.hpp"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>

#include "base/ctl.hpp"

namespace ctl {
namespace {

struct Ends {
  host::Fd ours;
  host::Fd theirs;
};

// Both ends are closed in other programs; a raw terminal passes every byte on as it is.
Ends open_terminal() {
  Ends ends;
  std::array<char, 64> name{};
  ends.ours = host::Fd(posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC));
  if (!ends.ours || grantpt(ends.ours.get()) != 0 || unlockpt(ends.ours.get()) != 0 ||
      ptsname_r(ends.ours.get(), name.data(), name.size()) != 0) {
    return {};
  }
  ends.theirs = host::Fd(open(name.data(), O_RDWR | O_NOCTTY | O_CLOEXEC));
  termios modes{};
  if (!ends.theirs || tcgetattr(ends.theirs.get(), &modes) != 0) {
    return {};
  }
  cfmakeraw(&modes);
  return tcsetattr(ends.theirs.get(), TCSANOW, &modes) == 0 ? std::move(ends) : Ends{};
}

Ends open_ends() {
  Ends ends = open_terminal();
  int pipe_ends[2];
  if (!ends.ours && pipe2(pipe_ends, O_CLOEXEC) == 0) {
    ends.ours = host::Fd(pipe_ends[0]);
    ends.theirs = host::Fd(pipe_ends[1]);
  }
  return ends;
}

// 0 or an errno value.
int spawn(const std::vector<std::string>& arguments, int output, pid_t* pid) {
  std::vector<char*> argv;
  argv.reserve(arguments.size() + 1);
  for (const std::string& argument : arguments) {
    argv.push_back(const_cast<char*>(argument.c_str()));
  }
  argv.push_back(nullptr);
  posix_spawnattr_t attributes;
  posix_spawn_file_actions_t files;
  posix_spawnattr_init(&attributes);  // neither can fail on Linux
  posix_spawn_file_actions_init(&files);
  posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETPGROUP);
  int error = posix_spawn_file_actions_addopen(&files, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  for (const int fd : {STDOUT_FILENO, STDERR_FILENO}) {
    error = error != 0 ? error : posix_spawn_file_actions_adddup2(&files, output, fd);
  }
  if (error == 0) {
    error = posix_spawn(pid, argv[0], &files, &attributes, argv.data(), environ);
  }
  posix_spawn_file_actions_destroy(&files);
  posix_spawnattr_destroy(&attributes);
  return error;
}

}  // namespace

Child::Child(const std::vector<std::string>& arguments) {
  Ends ends = open_ends();
  const int error = ends.ours ? spawn(arguments, ends.theirs.get(), &pid_) : errno;
  if (error != 0) {
    throw Failure(arguments.front() + " can't be started (" + std::strerror(error) + ")");
  }
  output_ = std::move(ends.ours);
}

Child::~Child() {
  if (!has_ended()) {
    kill(-pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
  }
}

std::string Child::read_output(std::chrono::milliseconds wait) {
  pollfd poller{output_.get(), POLLIN, 0};
  std::array<char, 16384> bytes;
  if (poll(&poller, 1, static_cast<int>(wait.count())) <= 0) {
    return {};
  }
  const ssize_t got = read(output_.get(), bytes.data(), bytes.size());
  if (got > 0) {
    return {bytes.data(), static_cast<std::size_t>(got)};
  }
  // Nobody writes any more (a terminal says so with an error), so waiting means for the end.
  poll(nullptr, 0, static_cast<int>(std::min(wait, std::chrono::milliseconds(10)).count()));
  return {};
}

bool Child::has_ended() {
  int status = 0;
  if (!ended_ && waitpid(pid_, &status, WNOHANG) == pid_) {
    constexpr int kSignalled = 128;
    ended_ = true;
    exit_status_ = WIFEXITED(status) ? WEXITSTATUS(status) : kSignalled + WTERMSIG(status);
  }
  return ended_;
}

void Child::send_signal(int signal) const {
  if (!ended_) {
    kill(pid_, signal);
  }
}

}  // namespace ctl
