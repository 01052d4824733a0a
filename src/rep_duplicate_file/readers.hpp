// Threads that read the samples and compute the digests of many files.
//
// - The caller waits until all is done, and measures meanwhile; so it has its own order, lines and
//   counters to itself. Threads make system calls and the platform's digest only: no message, no
//   tally.
// - How many work is found by trying (thread_count.hpp), beginning with one, so that a head that
//   must seek has one reader. One too many stops between two parts of a file, not only at its end:
//   a trial with two huge files would else last as long as they do. Trials are short where threads
//   wait for nothing: what lies in the cache is read before long ones end.
// - Threads take no signals, and the handler of SIGTERM needs no lock of theirs.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

#include "thread_count.hpp"

namespace vornreport {

class Readers {
 public:
  static constexpr unsigned kMost = 8;
  // What a file costs besides its bytes, in bytes.
  static constexpr uint64_t kFileCost = 16384;

  enum class Kind { kSamples, kDigests };  // each has a number of threads of its own

  // `threads`: 0 for as many as give speed, or a fixed number.
  explicit Readers(unsigned threads = 0);
  ~Readers();
  Readers(const Readers&) = delete;
  Readers& operator=(const Readers&) = delete;

  // Calls work(i) for each i below `count`, begun in this order, from several threads at once, or
  // from this one if none can be started; returns when all have returned. `work` must not throw.
  // errno is left alone.
  void for_each(Kind kind, size_t count, const std::function<void(size_t)>& work);

 private:
  using Clock = std::chrono::steady_clock;
  using Lock = std::unique_lock<std::mutex>;

  // The number of threads for one kind of work, and the stretch that is being measured.
  struct Pace {
    ThreadCount threads;
    uint64_t done = 0;  // bytes
    Clock::duration time{};
    Clock::duration cpu{};  // of all processors together
  };

  static void step(unsigned long long bytes);
  unsigned wanted() const;
  void start_threads();
  void work();
  void work_on(Lock& lock);
  void pause_if_too_many(uint64_t bytes);
  void measure();

  const unsigned fixed_count_;
  Pace samples_, digests_;
  std::vector<std::thread> threads_;

  // Guards all that follows.
  std::mutex mutex_;
  std::condition_variable work_;    // something to begin
  std::condition_variable resume_;  // for those who stopped within a file
  std::condition_variable done_;
  const std::function<void(size_t)>* task_ = nullptr;
  Pace* pace_ = &samples_;                     // of the task
  size_t next_ = 0, count_ = 0, portion_ = 1;  // files that a thread takes at once
  unsigned active_ = 0, paused_ = 0;
  bool is_stopping_ = false;
  uint64_t bytes_done_ = 0;  // since the mark
  Clock::time_point mark_;
  Clock::duration cpu_mark_{};  // of the process
};

}  // namespace vornreport
