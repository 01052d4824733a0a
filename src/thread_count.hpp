// How many threads read a disk at once. Nobody knows it beforehand: one head that must seek
// gets slower with every thread, an array of disks or a network is asleep with few, and what lies
// in the cache is a matter of processors. What the kernel says of a disk can't be trusted (an array
// is many of them, a virtual one says anything). So the number is found by trying, for as long as
// the work lasts: more while that pays, back when it doesn't.
#pragma once

#include <algorithm>
#include <cstdint>

namespace vornreport {

class ThreadCount {
 public:
  // More bring next to nothing anywhere, and each costs memory.
  static constexpr unsigned kMost = 16;

  // Begins with `begin` threads; never more than `most`.
  explicit ThreadCount(unsigned begin = 2, unsigned most = kMost)
      : most_(most), count_(std::min(begin, most)), settled_(count_) {}

  // Threads that are to work now.
  unsigned count() const { return count_; }

  // A stretch of the work with count() threads is over. `rate`: what was done per second in it.
  // `is_ahead`: the threads were held up because what they had found wasn't taken, so that the rate
  // says nothing of them; fewer will do.
  void end_stretch(double rate, bool is_ahead);

 private:
  enum class Trying : uint8_t { kNothing, kMore, kFewer };

  void try_next(Trying next);
  void settle(unsigned count, double rate);

  unsigned most_;
  unsigned count_;
  unsigned settled_;         // the number that the trial is compared with
  double settled_rate_ = 0;  // 0: not known yet
  Trying trying_ = Trying::kNothing;
  unsigned quiet_ = 0;     // stretches until the next trial
  unsigned patience_ = 1;  // how long the last quiet was; it grows while trials change nothing
};

}  // namespace vornreport
