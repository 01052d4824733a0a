#include "sigterm.hpp"

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <chrono>
#include <csignal>
#include <cstring>
#include <ctime>
#include <string_view>

#include "module.hpp"
#include "shell.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr int kMessageLine = 559;
constexpr int kChannelWaitMs = 200;

// Files to remove, by their full names; an empty name is skipped.
struct DoomedFiles {
  PathText stat_db;
  PathText stat_db_journal;
  PathText profile_db;
  PathText profile_db_journal;
  PathText index_copy;
  PathText progress;
  PathText data;
  PathText body;
  PathText scratch;
};

DoomedFiles g_files;
int g_log_socket = -1;
long g_utc_offset = 0;  // seconds east of UTC; the handler can't call localtime

// Text that is put together without any library call that may lock or allocate. What doesn't fit
// is cut.
class HandlerText {
 public:
  HandlerText& operator<<(std::string_view text) {
    const size_t room = sizeof bytes_ - length_;
    const size_t count = text.size() < room ? text.size() : room;
    std::memcpy(bytes_ + length_, text.data(), count);
    length_ += count;
    return *this;
  }
  // At least `width` wide, filled on the left.
  HandlerText& number(long value, size_t width = 0, char fill = '0') {
    char digits[24];
    const auto end = std::to_chars(digits, digits + sizeof digits, value).ptr;
    const auto count = static_cast<size_t>(end - digits);
    for (size_t i = count; i < width; ++i) {
      *this << std::string_view(&fill, 1);
    }
    return *this << std::string_view(digits, count);
  }
  const char* data() const { return bytes_; }
  size_t size() const { return length_; }

 private:
  char bytes_[1024];
  size_t length_ = 0;
};

// "Nov 21 02:04:26", as syslog(3) heads its lines.
void append_timestamp(HandlerText& text) {
  static constexpr std::string_view kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                                 "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  const std::chrono::sys_seconds local{std::chrono::seconds(now.tv_sec + g_utc_offset)};
  const auto day = std::chrono::floor<std::chrono::days>(local);
  const std::chrono::year_month_day date(day);
  const std::chrono::hh_mm_ss clock(local - day);
  text << kMonths[static_cast<unsigned>(date.month()) - 1] << " ";
  text.number(static_cast<unsigned>(date.day()), 2, ' ') << " ";
  text.number(clock.hours().count(), 2) << ":";
  text.number(clock.minutes().count(), 2) << ":";
  text.number(clock.seconds().count(), 2);
}

bool wait_writable(int fd) {
  pollfd poller{fd, POLLOUT, 0};
  return poll(&poller, 1, kChannelWaitMs) == 1 && (poller.revents & POLLOUT) != 0;
}

sockaddr_un log_address() {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  static constexpr char kPath[] = "/dev/log";
  std::memcpy(address.sun_path, kPath, sizeof kPath);
  return address;
}

// Some log daemons listen on a stream socket, where each record ends in a NUL.
void send_log_stream(const sockaddr_un& address, const HandlerText& text) {
  const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
  if (fd >= 0 && connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) {
    send(fd, text.data(), text.size(), MSG_NOSIGNAL | MSG_MORE);
    send(fd, "", 1, MSG_NOSIGNAL);
  }
}

void send_log(const HandlerText& text) {
  const sockaddr_un address = log_address();
  const auto send_once = [&] {
    return sendto(g_log_socket, text.data(), text.size(), MSG_NOSIGNAL | MSG_DONTWAIT,
                  reinterpret_cast<const sockaddr*>(&address), sizeof address);
  };
  if (send_once() >= 0) {
    return;
  }
  if (errno == EPROTOTYPE) {
    send_log_stream(address, text);
    return;
  }
  // A full queue: its reader gets a moment, then the line is dropped. An unconnected socket can't
  // be polled for room at its peer, so this is a plain pause.
  constexpr int kRounds = 10;
  for (int round = 0; round < kRounds && errno == EAGAIN; ++round) {
    poll(nullptr, 0, kChannelWaitMs / kRounds);
    if (send_once() >= 0) {
      return;
    }
  }
}

// Both channels, as the error log's simple form writes them.
void send_message(int error) {
  HandlerText reason;
  if (error != 0) {
    const char* description = strerrordesc_np(error);
    reason << "(" << (description != nullptr ? description : "unknown error") << ")";
  }
  const std::string_view shown(reason.data(), reason.size());
  HandlerText message;
  message << "Get SIGTERM, clean and exit, pid=";
  message.number(getpid()) << "\n";
  const std::string_view body(message.data(), message.size());

  HandlerText log;
  log << "<";
  log.number(LOG_USER | LOG_ERR) << ">";
  append_timestamp(log);
  log << " " << program_invocation_short_name << ": " << kDriverModule << ":";
  log.number(kMessageLine) << " " << shown << body;
  if (g_log_socket >= 0) {
    send_log(log);
  }

  HandlerText output;
  output << "(" << kDriverModule << ":";
  output.number(kMessageLine) << ")" << shown << body;
  // Short enough to go out whole where poll sees room: a pipe nobody reads must not hold us.
  if (wait_writable(STDOUT_FILENO)) {
    static_cast<void>(!write(STDOUT_FILENO, output.data(), output.size()));
  }
}

void remove_files() {
  const PathText* const files[] = {&g_files.stat_db,    &g_files.stat_db_journal,
                                   &g_files.profile_db, &g_files.profile_db_journal,
                                   &g_files.index_copy, &g_files.progress,
                                   &g_files.data,       &g_files.body,
                                   &g_files.scratch};
  for (const PathText* file : files) {
    if (!file->empty()) {
      unlink(file->c_str());
    }
  }
}

void prepare_files() {
  const auto pid = static_cast<unsigned>(getpid());
  g_files.data = report_data_path();
  g_files.body.format(VORN_TMP_BODY_FORMAT, pid);
  g_files.scratch.format(VORN_TMP_CMD_FORMAT, pid);
  HashHandle locations(VLIBCSzHashAlloc(kPlatformSlots));
  if (!locations ||
      with_address(locations, [](VLIBCSzHash** h) { return VornQazInitLocation(h, 0); }) < 0) {
    return;
  }
  if (const char* stat_db = set_value(locations.get(), "real_path_stat_db"); stat_db != nullptr) {
    g_files.stat_db.format("%s", stat_db);
    g_files.stat_db_journal.format("%s-journal", stat_db);
  }
}

}  // namespace

int setup_signal(int signo) {
  prepare_files();
  if (g_log_socket < 0) {
    g_log_socket = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  }
  const time_t now = time(nullptr);
  tm local{};
  if (localtime_r(&now, &local) != nullptr) {
    g_utc_offset = local.tm_gmtoff;
  }
  struct sigaction action {};
  action.sa_handler = sigterm_handler;
  action.sa_flags = 0;
  sigemptyset(&action.sa_mask);
  sigaddset(&action.sa_mask, signo);
  return sigaction(signo, &action, nullptr);
}

void sigterm_handler(int signo) {
  if (signo != SIGTERM) {
    return;
  }
  const int error = errno;
  signal(SIGPIPE, SIG_IGN);  // a closed standard output must not end us before the clean-up
  send_message(error);
  end_running_command();
  remove_files();
  _exit(1);
}

void remove_when_terminated(const char* stat_db, const char* profile) {
  // The handler may read while this writes: a half-written name must not be unlinked, so the names
  // are complete before they are seen. SIGTERM waits meanwhile.
  sigset_t set;
  sigset_t before;
  sigemptyset(&set);
  sigaddset(&set, SIGTERM);
  sigprocmask(SIG_BLOCK, &set, &before);
  g_files.profile_db.clear();
  g_files.profile_db_journal.clear();
  g_files.index_copy.clear();
  if (!is_unset(stat_db)) {
    const std::string_view path = stat_db;
    const auto folder = static_cast<int>(path.rfind('/') + 1);
    g_files.index_copy.format("%.*s%s", folder, stat_db, VORN_INDEX_COPY);
    g_files.profile_db.format("%s", stat_db);
    g_files.profile_db_journal.format("%s-journal", stat_db);
  }
  g_files.progress.clear();
  if (!is_unset(profile)) {
    g_files.progress.format("%s/%s", VORN_PATH_PROGRESS, profile);
  }
  sigprocmask(SIG_SETMASK, &before, nullptr);
}

}  // namespace vornreport
