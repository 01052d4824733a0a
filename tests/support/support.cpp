#include "support.hpp"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include "vorn/report.h"

namespace support {
namespace {

int log_socket = -1;

class Environment : public testing::Environment, public testing::EmptyTestEventListener {
 public:
  void SetUp() override {
    // The tests write to the product's fixed places; only the sandbox makes those private.
    if (read_file("/proc/self/mounts").find(" /usr/vorn ") == std::string::npos) {
      std::fprintf(stderr, "tests: run them through tools/sandbox.sh\n");
      std::exit(2);
    }
    for (const auto& left : std::filesystem::directory_iterator("/usr/vorn")) {
      std::filesystem::remove_all(left);  // an earlier run's
    }
    // A stream, which syslog(3) falls back to: a datagram socket takes as few as ten messages
    // before the sender blocks, and the sender is this process.
    log_socket = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    const sockaddr_un address{.sun_family = AF_UNIX, .sun_path = "/dev/log"};
    unlink(address.sun_path);
    if (bind(log_socket, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
        listen(log_socket, 128) != 0) {
      std::perror("tests: /dev/log");
      std::exit(2);
    }
  }
  // Each test begins with an empty log, and no test can fill the socket's queue for the next.
  void OnTestStart(const testing::TestInfo& /*info*/) override { syslog_lines(); }
};

[[maybe_unused]] const bool added = [] {
  testing::AddGlobalTestEnvironment(new Environment);
  testing::UnitTest::GetInstance()->listeners().Append(new Environment);
  return true;
}();

}  // namespace

TempFolder::TempFolder() {
  std::string name = "/tmp/vorn-test-XXXXXX";
  if (mkdtemp(name.data()) == nullptr) {
    throw std::runtime_error("mkdtemp");
  }
  path_ = name;
}

TempFolder::~TempFolder() {
  std::error_code ignored;
  std::filesystem::remove_all(path_, ignored);
}

std::string TempFolder::path(std::string_view name) const {
  return name.empty() ? path_ : path_ + "/" + std::string(name);
}

void write_file(const std::string& path, std::string_view content) {
  std::filesystem::create_directories(std::filesystem::path(path).parent_path());
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << content;
  if (!file.flush()) {
    throw std::runtime_error("can't write " + path);
  }
}

std::string read_file(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return file ? std::string(std::istreambuf_iterator<char>(file), {}) : "<absent>";
}

bool exists(const std::string& path) {
  return std::filesystem::symlink_status(path).type() != std::filesystem::file_type::not_found;
}

struct stat status_of(const std::string& path) {
  struct stat status {};
  static_cast<void>(lstat(path.c_str(), &status));  // which leaves it zero when it fails
  return status;
}

std::set<std::string> names_in(const std::string& folder) {
  std::set<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder)) {
    names.insert(entry.path().filename());
  }
  return names;
}

std::vector<std::string> syslog_lines() {
  static std::vector<std::pair<int, std::string>> senders;  // connection, what came through it
  for (int sender = 0; (sender = accept4(log_socket, nullptr, nullptr, SOCK_CLOEXEC)) >= 0;) {
    senders.emplace_back(sender, "");
  }
  std::vector<std::string> lines;
  for (auto& [sender, received] : senders) {
    char chunk[8192];
    ssize_t size = 0;
    while ((size = recv(sender, chunk, sizeof chunk, MSG_DONTWAIT)) > 0) {
      received.append(chunk, static_cast<std::size_t>(size));
    }
    for (std::size_t end = 0; (end = received.find('\0')) != std::string::npos;) {
      // "<11>Jan  2 03:04:05 tag: text"; the tag is the test program's name
      const std::string line = received.substr(0, end);
      const std::size_t tag_end = line.find(": ");
      lines.push_back(tag_end == std::string::npos ? line : line.substr(tag_end + 2));
      received.erase(0, end + 1);
    }
  }
  return lines;
}

std::string syslog_text() {
  std::string text;
  for (const std::string& line : syslog_lines()) {
    text += (text.empty() ? "" : "\n") + line;
  }
  return text;
}

pid_t fork_child(const std::function<int()>& work) {
  std::fflush(nullptr);
  const pid_t child = fork();
  if (child == 0) {
    _exit(work());
  }
  return child;
}

int wait_child(pid_t child) {
  int status = 0;
  while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

bool passes_in_child(const std::function<void()>& check) {
  return wait_child(fork_child([&check] {
           check();
           return testing::Test::HasFailure() ? 1 : 0;
         })) == 0;
}

bool passes_in_zone(const char* zone, const std::function<void()>& check) {
  return passes_in_child([&] {
    setenv("TZ", zone, 1);
    tzset();
    check();
  });
}

OtherRun::OtherRun(const std::string& profile, const std::function<void()>& work) {
  int ready[2];
  if (pipe(ready) != 0) {
    throw std::runtime_error("pipe");
  }
  pid_ = fork_child([&] {
    const bool holds = VornQazProfileRunning(profile.c_str()) == 0;
    work();
    return write(ready[1], &holds, sizeof holds) > 0 ? pause() : 1;
  });
  close(ready[1]);
  started_ = read(ready[0], &started_, sizeof started_) > 0 && started_;
  close(ready[0]);
}

void OtherRun::end() {
  if (pid_ > 0) {
    kill(pid_, SIGKILL);
    wait_child(pid_);
    pid_ = -1;
  }
}

Hash make_hash(const std::vector<std::pair<std::string, std::string>>& entries) {
  VLIBCSzHash* hash = VLIBCSzHashAlloc(512);
  for (const auto& [key, value] : entries) {
    VLIBCSzHashSetValue(&hash, key.c_str(), value.c_str());
  }
  return Hash(hash);
}

List make_list() {
  return List(VLIBCSzListAlloc(512));
}

std::vector<std::string> texts(const List& list) {
  std::vector<std::string> result;
  for (int i = 0; i < VLIBCSzListCount(list.get()); ++i) {
    result.emplace_back(VLIBCSzListGet(list.get(), i));
  }
  return result;
}

}  // namespace support
