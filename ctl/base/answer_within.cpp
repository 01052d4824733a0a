#include "base/answer_within.hpp"

#include <fcntl.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>

#include "vorn/base/file_io.hpp"

namespace ctl {

std::optional<std::string> answer_within(std::chrono::milliseconds limit,
                                         const std::function<std::string()>& ask) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) {
    return std::nullopt;
  }
  host::Fd reading(ends[0]);
  host::Fd writing(ends[1]);
  const pid_t child = fork();
  if (child == 0) {
    const std::string answer = ask() + '\0';
    _exit(host::write_all(writing.get(), answer) ? 0 : 1);
  }
  if (child < 0) {
    return std::nullopt;
  }
  writing = host::Fd();
  const auto end = std::chrono::steady_clock::now() + limit;
  std::array<char, 4096> bytes{};
  pollfd poller{reading.get(), POLLIN, 0};
  std::string answer;
  for (ssize_t got = 1; got > 0 && !answer.ends_with('\0');) {
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
        end - std::chrono::steady_clock::now());
    const int wait = static_cast<int>(std::max(left, std::chrono::milliseconds(0)).count());
    got = poll(&poller, 1, wait) == 1 ? read(reading.get(), bytes.data(), bytes.size()) : 0;
    answer.append(bytes.data(), static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
  }
  // One that waits for a dead server can't even be killed, so nobody waits for its end.
  const bool is_whole = answer.ends_with('\0');
  kill(child, SIGKILL);
  waitpid(child, nullptr, is_whole ? 0 : WNOHANG);
  if (!is_whole) {
    return std::nullopt;
  }
  answer.pop_back();
  return answer;
}

}  // namespace ctl
