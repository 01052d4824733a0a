// Files and their sizes, summed up.
#pragma once

#include <cstdint>

namespace vornreport {

// Adds to a sum that stays at the greatest number when sparse files exceed it.
inline void add_bounded(uint64_t& sum, uint64_t value) {
  if (__builtin_add_overflow(sum, value, &sum)) {
    sum = UINT64_MAX;
  }
}

struct Amount {
  uint64_t files = 0;
  uint64_t bytes = 0;

  void add(uint64_t size) { add({1, size}); }
  void add(const Amount& other) {
    files += other.files;
    add_bounded(bytes, other.bytes);
  }
};

}  // namespace vornreport
