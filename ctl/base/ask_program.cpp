#include "base/ask_program.hpp"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <utility>

#include "base/ctl.hpp"
#include "vorn/base/file_io.hpp"

namespace ctl {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kLargestOutput = 64U << 20U;

struct Pipe {
  host::Fd read;
  host::Fd write;
};

Pipe make_pipe() {
  std::array<int, 2> ends{-1, -1};
  if (pipe2(ends.data(), O_CLOEXEC) != 0) {
    throw Failure(std::string("no pipe can be made (") + std::strerror(errno) + ")");
  }
  return {host::Fd(ends[0]), host::Fd(ends[1])};
}

// A started program; it doesn't outlive its owner.
class Started {
 public:
  explicit Started(pid_t pid) : pid_(pid) {}
  Started(const Started&) = delete;
  Started& operator=(const Started&) = delete;
  ~Started() {
    if (pid_ > 0) {
      kill(pid_, SIGKILL);
      wait();
    }
  }

  int wait() {
    int status = 0;
    while (waitpid(pid_, &status, 0) < 0 && errno == EINTR) {
    }
    pid_ = -1;
    constexpr int kSignalBase = 128;
    return WIFEXITED(status) ? WEXITSTATUS(status) : kSignalBase + WTERMSIG(status);
  }

 private:
  pid_t pid_;
};

std::vector<std::string> c_environment() {
  std::vector<std::string> variables{"LC_ALL=C"};
  for (char** variable = environ; *variable != nullptr; ++variable) {
    if (std::strncmp(*variable, "LC_ALL=", 7) != 0) {
      variables.emplace_back(*variable);
    }
  }
  return variables;
}

std::vector<char*> pointers(std::vector<std::string>& texts) {
  std::vector<char*> found(texts.size());
  std::transform(texts.begin(), texts.end(), found.begin(),
                 [](std::string& text) { return text.data(); });
  found.push_back(nullptr);
  return found;
}

// The process id, or 0 when there is no such program.
pid_t start(std::vector<std::string> arguments, const Pipe& out, const Pipe& error) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  posix_spawn_file_actions_adddup2(&actions, out.write.get(), STDOUT_FILENO);
  posix_spawn_file_actions_adddup2(&actions, error.write.get(), STDERR_FILENO);
  std::vector<std::string> variables = c_environment();
  pid_t pid = 0;
  const int failure = posix_spawnp(&pid, arguments[0].c_str(), &actions, nullptr,
                                   pointers(arguments).data(), pointers(variables).data());
  posix_spawn_file_actions_destroy(&actions);
  if (failure != 0 && failure != ENOENT) {
    throw Failure(arguments[0] + " can't be run (" + std::strerror(failure) + ")");
  }
  return failure == 0 ? pid : 0;
}

// Takes what the pipe holds; false at its end.
bool take(int fd, std::string& text) {
  std::array<char, 16384> chunk{};
  const ssize_t got = read(fd, chunk.data(), chunk.size());
  if (got > 0) {
    text.append(chunk.data(), static_cast<std::size_t>(got));
  }
  return got > 0 || (got < 0 && errno == EINTR);
}

}  // namespace

std::optional<Answer> ask_program(const std::vector<std::string>& arguments,
                                  std::chrono::seconds limit) {
  Pipe out = make_pipe();
  Pipe error = make_pipe();
  const pid_t pid = start(arguments, out, error);
  if (pid == 0) {
    return std::nullopt;
  }
  Started program(pid);
  out.write = {};
  error.write = {};
  Answer answer;
  std::array<pollfd, 2> waits{{{out.read.get(), POLLIN, 0}, {error.read.get(), POLLIN, 0}}};
  const auto deadline = Clock::now() + limit;
  while (waits[0].fd >= 0 || waits[1].fd >= 0) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
    if (left.count() <= 0 || answer.out.size() + answer.error.size() > kLargestOutput) {
      throw Failure(arguments[0] + " takes too long or prints too much; run it by hand to see why");
    }
    if (poll(waits.data(), waits.size(), static_cast<int>(left.count())) <= 0) {
      continue;
    }
    for (std::size_t i = 0; i < waits.size(); ++i) {
      std::string& text = i == 0 ? answer.out : answer.error;
      if (waits[i].fd >= 0 && waits[i].revents != 0 && !take(waits[i].fd, text)) {
        waits[i].fd = -1;  // poll leaves it out
      }
    }
  }
  answer.status = program.wait();
  return answer;
}

}  // namespace ctl
