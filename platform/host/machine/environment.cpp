// The process that the program and its children run in.
#include <fcntl.h>
#include <malloc.h>
#include <sqlite3.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>

#include "machine/sqlite_memory.hpp"
#include "vorn/report.h"

#if defined(__SANITIZE_ADDRESS__)
#define VORN_HOST_ASAN 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define VORN_HOST_ASAN 1
#endif
#endif

namespace {

// A closed descriptor 0 to 2 would be handed to the next file that is opened, and then every
// message to standard output would go into a database.
void open_standard_descriptors() {
  for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
    if (fcntl(fd, F_GETFD) < 0 && errno == EBADF) {
      // The lowest free descriptor is taken, which is this one.
      static_cast<void>(open("/dev/null", O_RDWR));
    }
  }
}

// What shell commands inherit. Nothing of the caller's environment reaches them, or this process:
// the time zone is the system's.
void set_environment() {
  clearenv();
  setenv("PATH", "/usr/sbin:/usr/bin:/sbin:/bin", 1);
  setenv("LC_ALL", "C.UTF-8", 1);
  setenv("HOME", "/", 1);
}

// A walk holds one descriptor per level, and a path of 4096 bytes has room for 2048 levels.
void raise_file_limit() {
  constexpr rlim_t kNeeded = 8192;
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur >= kNeeded) {
    return;
  }
  if (limit.rlim_max < kNeeded) {
    const rlimit raised{kNeeded, kNeeded};
    if (setrlimit(RLIMIT_NOFILE, &raised) == 0) {
      return;  // privileged
    }
  }
  limit.rlim_cur = std::min(limit.rlim_max, kNeeded);
  static_cast<void>(setrlimit(RLIMIT_NOFILE, &limit));
}

// What a sort has freed goes back to the system at once. By itself the allocator would keep, for
// each thread, as much as the largest block was, and a run's peak would be the sum of what all had
// once.
void return_memory_early() {
  constexpr int kKept = 256 * 1024;  // bytes
  mallopt(M_MMAP_THRESHOLD, kKept);
  mallopt(M_TRIM_THRESHOLD, kKept);
}

// Only a saving of time: where SQLite is already running these are refused, and all works as well,
// since it locks each connection by itself then.
void configure_sqlite() {
  // Every connection belongs to one thread.
  sqlite3_config(SQLITE_CONFIG_MULTITHREAD);
  sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0);
  // Pages (2 MiB) that a sort gathers before it writes them out: two sorts at work should fit into
  // the processor's caches.
  constexpr unsigned kSortedRun = 256;
  sqlite3_config(SQLITE_CONFIG_PMASZ, kSortedRun);
#ifndef VORN_HOST_ASAN  // the sanitizer sees errors in blocks of the system allocator only
  sqlite3_config(SQLITE_CONFIG_MALLOC, &host::sqlite_memory);
#endif
}

bool prepared = false;

[[gnu::noinline]] void prepare() {
  prepared = true;
  open_standard_descriptors();
  set_environment();
  umask(S_IWGRP | S_IRWXO);
  // Standard output may be a pipe whose reader has gone; that is no reason to lose a run.
  static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
  // Nor is a limit on the size of files: the write fails, and that is told.
  static_cast<void>(std::signal(SIGXFSZ, SIG_IGN));
  raise_file_limit();
  return_memory_early();
  configure_sqlite();
  errno = 0;  // what the start of the process has left there would stand in the first messages
}

}  // namespace

void VornQazSetEnv() {
  if (!prepared) [[unlikely]] {
    prepare();
  }
}
