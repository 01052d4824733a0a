// What one run counted, in the form in which it is kept for later runs to compare with.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "facts/amount.hpp"
#include "report_format/facts.hpp"

namespace vornreport {

// What a share holds on one volume.
struct SnapshotPart {
  std::string volume;  // mount path; empty when it couldn't be told
  Amount total;
  std::map<std::string, Amount> owners;  // by account name
  std::map<std::string, Amount> types;   // by label
};

// A folder with everything below it.
struct SnapshotFolder {
  std::string folder;  // below the share's top, which itself is "."
  std::string volume;  // that it lies on
  Amount amount;
};

struct SnapshotShare {
  std::string name;
  bool is_whole = false;         // everything in it was read
  bool has_all_folders = false;  // `folders` lacks none
  std::vector<SnapshotPart> parts;
  std::vector<SnapshotFolder> folders;
};

struct SnapshotQuota {
  std::string volume, user;
  uint64_t used = 0, quota = 0;  // bytes; the soft limit
};

struct Snapshot {
  int64_t time = 0;  // seconds since the epoch
  // Who may stand among the owners: nothing when none were kept, "" for everyone, else the names of
  // the profile's limit. Only sets that agree can be compared by owner.
  std::optional<std::string> owners_among;
  bool has_types = false;
  std::vector<SnapshotShare> shares;
  std::vector<SnapshotQuota> quotas;

  const SnapshotShare* find(const std::string& share) const;  // null when it lacks the share
  size_t folder_count() const;
  // The size of the smallest folder in it; nothing without folders.
  std::optional<uint64_t> smallest_folder() const;
  // Leaves the `most` largest folders; of those of one size the shorter paths stay.
  void cut_folders(size_t most);
};

// Two texts: who only wants to know how large shares were, or how much users had, reads the first.
struct SnapshotText {
  std::string summary, details;
};
SnapshotText to_text(const Snapshot& snapshot);
// Nothing for a text that is damaged or of another version. Without `details` there are neither
// owners, types nor folders.
std::optional<Snapshot> snapshot_of(int64_t time, const SnapshotText& text);

// What earlier runs saw of a thing: samples in order of time.
struct SnapshotSamples {
  using Samples = std::vector<report_format::Sample>;
  std::map<std::string, Samples> shares;  // those read as a whole
  // By volume and user: of those that are there already, or every set's users would take memory.
  std::map<std::pair<std::string, std::string>, Samples> users;
  void add(const Snapshot& snapshot);
};

}  // namespace vornreport
