#include "readers.hpp"

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <system_error>

#include "signals_blocked.hpp"
#include "vorn/report.h"

namespace vornreport {
namespace {

// Of the search for the number of threads, where they wait for a disk, and where they hardly do.
constexpr std::chrono::milliseconds kStretch{100};
constexpr std::chrono::milliseconds kBusyStretch{20};
constexpr size_t kSamplePortion = 16;  // of which each takes microseconds

thread_local Readers* t_readers = nullptr;  // that this thread belongs to

// Digests are a matter of processors as well as of the disk, and each has a buffer of a MiB.
unsigned most_digests() {
  return std::clamp(std::thread::hardware_concurrency(), 1U, Readers::kMost);
}

// That the process has used.
std::chrono::nanoseconds cpu_time() {
  struct timespec time {};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
  return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

}  // namespace

Readers::Readers(unsigned threads)
    : fixed_count_(threads),
      samples_{.threads = ThreadCount(1, kMost)},
      digests_{.threads = ThreadCount(1, most_digests())} {
  VornQazSetDigestStep(&Readers::step);
}

Readers::~Readers() {
  {
    const Lock lock(mutex_);
    is_stopping_ = true;
    work_.notify_all();
  }
  for (std::thread& thread : threads_) {
    thread.join();
  }
  VornQazSetDigestStep(nullptr);
}

void Readers::for_each(Kind kind, size_t count, const std::function<void(size_t)>& work) {
  const int before = errno;
  Lock lock(mutex_);
  pace_ = kind == Kind::kSamples ? &samples_ : &digests_;
  task_ = &work;
  next_ = 0;
  count_ = count;
  portion_ = kind == Kind::kSamples ? kSamplePortion : 1;
  bytes_done_ = 0;
  mark_ = Clock::now();
  cpu_mark_ = cpu_time();
  start_threads();
  if (threads_.empty()) {
    next_ = count;
    for (size_t i = 0; i < count; ++i) {
      work(i);
    }
  }
  const auto is_done = [this] { return next_ == count_ && active_ == 0 && paused_ == 0; };
  while (!done_.wait_for(lock, kBusyStretch, is_done)) {
    measure();
    start_threads();
  }
  task_ = nullptr;
  errno = before;
}

unsigned Readers::wanted() const {
  return fixed_count_ != 0 ? fixed_count_ : pace_->threads.count();
}

// Has as many at work as are wanted.
void Readers::start_threads() {
  const SignalsBlocked blocked;
  try {
    while (threads_.size() < std::min<size_t>(wanted(), count_)) {
      threads_.emplace_back([this] { this->work(); });
    }
  } catch (const std::system_error&) {
    // Those that there are do it.
  }
  resume_.notify_all();
  work_.notify_all();
}

void Readers::work() {
  t_readers = this;
  Lock lock(mutex_);
  for (;;) {
    work_.wait(lock, [this] {
      return is_stopping_ || (task_ != nullptr && next_ < count_ && active_ + paused_ < wanted());
    });
    if (is_stopping_) {
      return;
    }
    ++active_;
    work_on(lock);
    --active_;
    resume_.notify_one();
    done_.notify_one();
  }
}

void Readers::work_on(Lock& lock) {
  while (next_ < count_ && active_ <= wanted()) {
    const size_t begin = next_;
    const size_t end = next_ = std::min(begin + portion_, count_);
    lock.unlock();
    for (size_t i = begin; i < end; ++i) {
      (*task_)(i);
    }
    lock.lock();
    bytes_done_ += (end - begin) * kFileCost;
  }
  measure();
}

// The platform calls it between two parts of a file.
void Readers::step(unsigned long long bytes) {
  if (t_readers != nullptr) {
    t_readers->pause_if_too_many(bytes);
  }
}

void Readers::pause_if_too_many(uint64_t bytes) {
  Lock lock(mutex_);
  bytes_done_ += bytes;
  if (active_ <= wanted()) {
    return;
  }
  --active_;
  ++paused_;
  resume_.wait(lock, [this] { return active_ < wanted(); });
  --paused_;
  ++active_;
}

// Adds what was done since the mark to the stretch, unless others than the wanted number did it.
void Readers::measure() {
  const Clock::time_point now = Clock::now();
  const Clock::duration cpu = cpu_time();
  if (active_ == wanted()) {
    pace_->time += now - mark_;
    pace_->cpu += cpu - cpu_mark_;
    pace_->done += bytes_done_;
  }
  mark_ = now;
  cpu_mark_ = cpu;
  bytes_done_ = 0;
  const bool is_busy = pace_->cpu * 5 >= pace_->time * wanted() * 4;
  if (pace_->time >= (is_busy ? kBusyStretch : kStretch)) {
    const std::chrono::duration<double> seconds = pace_->time;
    pace_->threads.end_stretch(static_cast<double>(pace_->done) / seconds.count(), false);
    pace_->time = pace_->cpu = {};
    pace_->done = 0;
  }
}

}  // namespace vornreport
