// What gathering counts while it passes every file: sums by share, volume, owner and type, in
// memory that grows with their numbers and not with the number of files.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <map>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "vornreport/statistics_db.hpp"

namespace vornreport {

struct Amount {
  uint64_t files = 0;
  uint64_t bytes = 0;  // stays at the greatest number when sparse files exceed it

  void add(uint64_t size) { add({1, size}); }
  void add(const Amount& other) {
    files += other.files;
    if (__builtin_add_overflow(bytes, other.bytes, &bytes)) {
      bytes = UINT64_MAX;
    }
  }
};

// Where the rows of a share come from.
enum class RowSource : uint8_t { kWalk, kIndex };

// The counts of one share.
class ShareTally {
 public:
  ShareTally(std::string name, std::string path, std::string volume);

  // Counts a file that went into the statistics database. An index tells no device and no blocks.
  void file(const FileInfo& info, RowSource source);
  void folder() { ++folders_; }
  void unreadable() { ++unreadable_; }
  void other() { ++other_; }
  // Nothing of it could be read.
  void missing() { is_missing_ = true; }
  // Takes back all that was counted: the rows come from elsewhere.
  void begin_again();
  // To be called while the type labels of the files live.
  void finish();

  const std::string& name() const { return name_; }
  const std::string& path() const { return path_; }
  const std::string& volume() const { return volumes_.front(); }
  const Amount& total() const { return total_; }
  uint64_t allocated() const { return allocated_; }  // bytes; a link counts for its part
  uint64_t folders() const { return folders_; }
  uint64_t unreadables() const { return unreadable_; }
  uint64_t others() const { return other_; }
  bool is_missing() const { return is_missing_; }
  bool is_whole() const { return !is_missing_ && unreadable_ == 0; }

  using OwnerOnVolume = std::pair<uid_t, std::string>;  // and the volume's mount path
  std::map<OwnerOnVolume, Amount> owners() const;
  const std::map<std::string, Amount>& types() const { return types_; }

 private:
  size_t volume_of(dev_t device, const char* path);

  std::string name_, path_;
  std::vector<std::string> volumes_;               // mount paths; the first is the share's own
  std::vector<std::pair<dev_t, size_t>> devices_;  // with the index of their volume
  Amount total_;
  uint64_t allocated_ = 0, folders_ = 0, unreadable_ = 0, other_ = 0;
  bool is_missing_ = false;
  std::unordered_map<uint64_t, Amount> by_owner_;     // user id, and index of the volume above it
  std::unordered_map<const char*, Amount> by_label_;  // by address: a label has several
  std::map<std::string, Amount> types_;
};

// The file that was changed the longest ago.
struct OldestFile {
  uint32_t mtime = UINT32_MAX;  // as stored
  std::string path;
};

// All shares of a run.
class Tallies {
 public:
  // From here on counts go to this share.
  void begin_share(const char* name, const char* path);
  // Null outside gathering.
  ShareTally* share() { return is_counting_ ? &shares_.back() : nullptr; }
  void end_share();
  void clear();

  void file(const FileInfo& info, RowSource source) {
    if (is_counting_) {
      count_file(info, source);
    }
  }
  const std::vector<ShareTally>& shares() const { return shares_; }
  const OldestFile& oldest() const { return oldest_; }
  uint64_t files() const { return files_; }

 private:
  void count_file(const FileInfo& info, RowSource source);

  std::vector<ShareTally> shares_;
  OldestFile oldest_;
  uint64_t files_ = 0;
  bool is_counting_ = false;
};

Tallies& tallies();

}  // namespace vornreport
