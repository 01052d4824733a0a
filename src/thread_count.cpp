#include "thread_count.hpp"

namespace vornreport {
namespace {

// Rates differ by a few parts in a hundred from stretch to stretch, since folders do.
constexpr double kGain = 1.1;    // what more threads must bring
constexpr double kSame = 0.97;   // what fewer may cost
constexpr double kChange = 1.4;  // beyond it the device has changed (a cache has come to its end)
constexpr unsigned kMostPatience = 64;
constexpr unsigned kKnown = 4;  // patience where a trial has just told what fewer would do

constexpr unsigned fewer_than(unsigned count) {
  return std::max(count / 2, 1U);
}

}  // namespace

void ThreadCount::settle(unsigned count, double rate) {
  settled_ = count_ = count;
  settled_rate_ = rate;
}

// Begins a trial, or a quiet time when there is nothing to try.
void ThreadCount::try_next(Trying next) {
  trying_ = next;
  count_ = next == Trying::kMore    ? std::min(settled_ * 2, most_)
           : next == Trying::kFewer ? fewer_than(settled_)
                                    : settled_;
  if (next == Trying::kMore && count_ == settled_) {
    try_next(Trying::kFewer);
  } else if (next == Trying::kFewer && count_ == settled_) {
    try_next(Trying::kNothing);
  } else if (next == Trying::kNothing) {
    patience_ = std::min(patience_ * 2, kMostPatience);
    quiet_ = patience_;
  }
}

void ThreadCount::end_stretch(double rate, bool is_ahead) {
  if (is_ahead) {
    settle(fewer_than(count_), 0);
    trying_ = Trying::kNothing;
    quiet_ = 1;
    return;
  }
  switch (trying_) {
    case Trying::kMore:
      if (rate > settled_rate_ * kGain) {
        settle(count_, rate);
        patience_ = count_ == most_ ? kKnown : 1;
        try_next(count_ == most_ ? Trying::kNothing : Trying::kMore);
      } else {
        try_next(Trying::kFewer);
      }
      return;
    case Trying::kFewer:
      if (rate >= settled_rate_ * kSame) {
        settle(count_, rate);
        patience_ = 1;
        try_next(Trying::kFewer);
      } else {
        try_next(Trying::kNothing);
      }
      return;
    case Trying::kNothing:
      break;
  }
  const bool has_changed =
      settled_rate_ == 0 || rate > settled_rate_ * kChange || rate * kChange < settled_rate_;
  patience_ = has_changed ? 1 : patience_;
  quiet_ = has_changed ? 0 : quiet_ - std::min(quiet_, 1U);
  // Of the newest stretches, so that trials are compared with what is the case now.
  settled_rate_ = settled_rate_ == 0 || has_changed ? rate : (settled_rate_ + rate) / 2;
  if (quiet_ == 0) {
    try_next(Trying::kMore);
  }
}

}  // namespace vornreport
