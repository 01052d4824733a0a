// The largest folders of a run, each with everything below it, found in one pass: a folder's total
// is known when the walk leaves it. What is kept is bounded, and a tree: a parent is never smaller
// than its child, and of two of one size the one nearer to the top stays.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "facts/amount.hpp"

namespace vornreport {

struct LargeFolder {
  size_t share;        // its place among the run's shares
  std::string folder;  // below the share's top, which itself is "."
  size_t volume;       // that it lies on: its place among the share's volumes
  Amount amount;
  uint32_t newest;  // time of the last change in it, as stored; 0 without files
};

class FolderTotals {
 public:
  static constexpr size_t kMost = 10'000;

  // What follows is of this share.
  void begin_share(size_t share);
  // Takes back what was counted for the share.
  void forget_share(size_t share);

  // The walk goes into a folder of the one that it is in; the first is the share's top.
  void enter(std::string_view name, size_t volume);
  void file(uint64_t bytes, uint32_t changed);
  void leave();

  // The largest, by size; of those of one size the shorter path first, then the first found.
  std::vector<LargeFolder> largest() const;
  // Whether it has every folder of the share.
  bool has_all(size_t share) const { return !cut_.contains(share); }

 private:
  // A folder's path costs its name only: those above it are kept as well.
  struct Name {
    std::shared_ptr<const Name> above;  // null at the top
    std::string text;
  };
  struct Total {
    size_t share;
    std::shared_ptr<const Name> name;
    size_t length;  // of the whole path
    size_t volume;
    Amount amount;
    uint32_t newest;
    uint64_t ordinal;  // in which they were left
  };
  // A folder that the walk is in. Its total has a name once one below it is kept: most never are.
  struct Place {
    std::string text;
    Total total;
  };
  void name_places();
  static bool comes_before(const Total& one, const Total& two);
  static std::string path_of(const Name& name);

  size_t share_ = 0;
  uint64_t left_ = 0;
  std::vector<Place> inside_;
  std::vector<Total> kept_;  // a heap: the one that goes first is in front
  std::set<size_t> cut_;     // shares that lack a folder
};

}  // namespace vornreport
