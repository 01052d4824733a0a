// How full volumes are.
#ifndef VORN_HOST_VOLUME_SPACE_HPP
#define VORN_HOST_VOLUME_SPACE_HPP

#include <sys/statvfs.h>
#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "machine/volumes.hpp"

namespace host {

struct Space {
  std::uint64_t total;  // bytes: used and free ones
  std::uint64_t free;   // for users
};

// As df counts: what is reserved for root is neither used nor free, so it isn't in the total.
Space space_of(const struct statvfs& measured);

// What volumes had room for when they were measured, which was at most five minutes ago. A run
// stores a sample and then compares with it: measured anew, what was written in between, over a
// second, would pass for the speed at which a volume fills up. After a run of hours, on the other
// hand, a sample with the date of its end has to be one of its end.
class Measurements {
 public:
  using Clock = std::chrono::steady_clock;

  // Nothing, with an incident, for a volume that can't be measured; one log line for each attempt.
  std::optional<Space> of(const Volume& volume, Clock::time_point now = Clock::now());

 private:
  struct Measured {
    Clock::time_point time;
    std::optional<Space> space;
    std::string problem;  // without space
  };
  static Measured measure(const Volume& volume, Clock::time_point now);

  std::map<dev_t, Measured> known_;
};

}  // namespace host

#endif
