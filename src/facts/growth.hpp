// What has changed between what one run and an earlier one counted.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "facts/snapshot.hpp"

namespace vornreport {

// Earlier runs that one at `now` is compared with, by the times of their snapshots.
struct GrowthBases {
  std::optional<int64_t> last;   // the latest
  std::optional<int64_t> week;   // the nearest to 7 days ago, of those 5 to 14 days old
  std::optional<int64_t> month;  // the nearest to 30 days ago, of those 20 to 60 days old
};
// `times` in any order. Those later than `now` are of a clock that was ahead, and of no use until
// it gets there. Of two that are as near, the later one counts.
GrowthBases growth_bases(std::span<const int64_t> times, int64_t now);

enum class GrowthKind : uint8_t { kShare, kOwner, kType, kFolder, kFolderAtLeast };
const char* word_of(GrowthKind kind);

// What a share, or a part of it, has gained on one volume; negative for a loss, and never beyond 63
// bits.
struct Change {
  GrowthKind kind;
  std::string share;
  std::string volume;
  std::string name;  // of the owner, type or folder; empty for the share
  int64_t files;
  int64_t bytes;
};

// Changes of the shares that both sets have and that were read as a whole by both, unchanged ones
// included; of owners and types only where both sets have them, of owners those of one limit; of
// folders the kMostFoldersOfVolume greatest losses and gains on each volume.
//
// A folder that one set lacks counts as nothing in it when that set has all folders of the share.
// Else it was no larger than the smallest that the set has: the change is at least the difference,
// kFolderAtLeast, without files, of which nothing is known. That holds for one that has shrunk out
// of the set as for one that has grown into it; where it comes to nothing, nothing is told.
inline constexpr size_t kMostFoldersOfVolume = 500;
std::vector<Change> changes_between(const Snapshot& then, const Snapshot& now);

// The changes since one time.
struct GrowthSince {
  std::string since;  // "last", "week" or "month"
  int64_t time;       // of the earlier snapshot
  std::vector<Change> changes;
};
using Growth = std::vector<GrowthSince>;  // in that order

// The growth since one of them; null when there is none.
const GrowthSince* find_since(const Growth& growth, std::string_view since);
// The longest of them: since a month, else a week, else the last; null without any.
const GrowthSince* longest_of(const Growth& growth);

// For the report: over all volumes, of each since and kind the greatest, at least one different
// from nothing. `kFolder` and `kFolderAtLeast` are one kind.
inline constexpr size_t kMostGrowthRows = 200;
std::vector<Change> greatest_changes(const GrowthSince& since);

// The sum of both, within 63 bits.
int64_t bounded_sum(int64_t one, int64_t two);

}  // namespace vornreport
