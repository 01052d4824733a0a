// What gathering counts while it passes every file: sums by share, volume, owner, type, age and
// folder, in memory that grows with their numbers and not with the number of files.
#pragma once

#include <sys/types.h>

#include <array>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "facts/amount.hpp"
#include "facts/folder_totals.hpp"
#include "report_format/ages.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {

// Where the rows of a share come from.
enum class RowSource : uint8_t { kWalk, kIndex };

// What a share holds on one volume.
struct VolumeTally {
  std::string volume;  // its mount path; empty when it can't be told
  Amount total;
  uint64_t allocated = 0;   // bytes; a link counts for its part
  uint64_t explained = 0;   // of these, what no other share counts already
  uint64_t unreadable = 0;  // files and folders
  uint64_t other = 0;       // entries that are neither
  std::unordered_map<uid_t, Amount> owners;
  std::map<std::string, Amount> types;

  // Until the share is finished: by address, since a label has several.
  std::unordered_map<const char*, Amount> labels;
};

// Whether another share counts the same files.
enum class CountedElsewhere : bool { kNo, kYes };

// The counts of one share.
class ShareTally {
 public:
  using Ages = std::array<Amount, report_format::kAges.size()>;

  ShareTally(std::string name, std::string path, std::string volume);

  // The walk goes into a folder, with everything below it, and leaves it.
  void enter(dev_t device, const char* path, CountedElsewhere elsewhere);
  void leave();
  // Where it is: the index of the volume.
  size_t here() const { return inside_.empty() ? 0 : inside_.back().volume; }
  // Whether the files there are counted elsewhere.
  CountedElsewhere elsewhere() const {
    return inside_.empty() ? CountedElsewhere::kNo : inside_.back().elsewhere;
  }

  // Counts a file that went into the statistics database. An index tells no device and no blocks.
  void file(const FileInfo& info, RowSource source, int64_t now);
  void folder() { ++folders_; }
  void unreadable() { ++volumes_[here()].unreadable; }
  void other() { ++volumes_[here()].other; }
  // Nothing of it could be read.
  void missing() { is_missing_ = true; }
  // For an index: the folders below the share whose files others count; "" for all of it.
  void others_count(std::vector<std::string> folders) { of_others_ = std::move(folders); }
  // Takes back all that was counted: the rows come from elsewhere.
  void begin_again();
  // To be called while the type labels of the files live.
  void finish();

  const std::string& name() const { return name_; }
  const std::string& path() const { return path_; }
  const std::string& volume() const { return volumes_.front().volume; }  // of its top folder
  const std::vector<VolumeTally>& volumes() const { return volumes_; }
  const Ages& ages() const { return ages_; }
  Amount total() const;
  uint64_t allocated() const;
  uint64_t folders() const { return folders_; }
  uint64_t unreadables() const;
  uint64_t others() const;
  bool is_missing() const { return is_missing_; }
  bool is_whole() const { return !is_missing_ && unreadables() == 0; }
  bool is_of_index() const { return is_of_index_; }

 private:
  struct Place {
    dev_t device;
    size_t volume;
    CountedElsewhere elsewhere;
  };
  size_t volume_of(dev_t device, const char* path);
  bool is_counted_elsewhere(const char* path) const;

  std::string name_, path_;
  std::vector<VolumeTally> volumes_;               // the first is the share's own
  std::vector<std::pair<dev_t, size_t>> devices_;  // with the index of their volume
  std::vector<Place> inside_;                      // the folders that the walk is in
  std::vector<std::string> of_others_;
  Ages ages_{};
  uint64_t folders_ = 0;
  bool is_missing_ = false, is_of_index_ = false;
};

// The file that was changed the longest ago.
struct OldestFile {
  uint32_t mtime = UINT32_MAX;  // as stored
  std::string path;
};

// All shares of a run.
class Tallies {
 public:
  // From here on counts go to this share. `now`: the time that ages are seen from.
  void begin_share(const char* name, const char* path, int64_t now);
  // Null outside gathering.
  ShareTally* share() { return is_counting_ ? &shares_.back() : nullptr; }
  // The share's rows come from elsewhere.
  void begin_share_again();
  void end_share();
  void clear();

  // The walk goes into the folder `name` at `path`, and leaves it.
  void enter(std::string_view name, dev_t device, const char* path, CountedElsewhere elsewhere);
  void leave();
  void file(const FileInfo& info, RowSource source) {
    if (is_counting_) {
      count_file(info, source);
    }
  }
  // For rows of an index, which pass in any order: those of its folders, once more in their own.
  FolderTotals& folders() { return folders_; }

  const std::vector<ShareTally>& shares() const { return shares_; }
  std::vector<LargeFolder> largest_folders() const { return folders_.largest(); }
  bool has_all_folders(size_t share) const { return folders_.has_all(share); }
  const OldestFile& oldest() const { return oldest_; }
  uint64_t files() const { return files_; }

 private:
  void count_file(const FileInfo& info, RowSource source);

  std::vector<ShareTally> shares_;
  FolderTotals folders_;
  OldestFile oldest_;
  uint64_t files_ = 0;
  int64_t now_ = 0;
  bool is_counting_ = false;
};

Tallies& tallies();

}  // namespace vornreport
