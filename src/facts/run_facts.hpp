// What a run has found out so far. Gathering and the reports put it here while they learn it, and
// the step before page assembly makes the facts of it (facts.hpp). A process makes one report, so
// there is one; collecting for the whole server, which comes before, counts to it.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "facts/growth.hpp"
#include "report_format/facts.hpp"
#include "vorn/text.h"
#include "vorn/volume.h"

namespace vornreport {

// A volume as it was measured last.
struct MeasuredVolume {
  std::string path;
  uint64_t size = 0, free = 0;  // bytes
  int64_t time = 0;             // seconds since the epoch
};

// How far the rows of a report got.
struct RowCounts {
  uint64_t rows = 0;   // of the report
  uint64_t shown = 0;  // of these, in the page
};

// The users with soft limits on all volumes, and which of them are nearest to theirs or over.
class QuotaTally {
 public:
  static constexpr size_t kMostUsers = 20;

  // Sizes in bytes; a user without a limit isn't counted.
  void add(std::string volume, std::string user, uint64_t used, uint64_t quota);
  // Adds what another tally has counted.
  void add(QuotaTally&& other);
  // The most pressing first, at most kMostUsers; of equal ones those that were added first.
  std::vector<report_format::QuotaFacts> users() const;
  // All as they were added, for those who come to be among the most pressing later. What they take
  // is in proportion to the server's accounts, which a run knows by name anyway.
  const std::vector<SnapshotQuota>& all() const { return all_; }
  // All that are near or over, those that aren't kept included.
  uint64_t pressing() const { return pressing_; }

 private:
  struct IsMorePressing {
    bool operator()(const report_format::QuotaFacts& one,
                    const report_format::QuotaFacts& two) const {
      return one.percent > two.percent;
    }
  };
  using Users = std::multiset<report_format::QuotaFacts, IsMorePressing>;
  void keep(report_format::QuotaFacts facts);

  Users users_;
  std::vector<SnapshotQuota> all_;
  uint64_t pressing_ = 0;
};

struct RunFacts {
  std::string profile;
  int64_t started = 0;
  std::string language;
  std::vector<report_format::Incident> incidents;
  std::vector<MeasuredVolume> volumes;    // of the last measurement
  std::map<std::string, RowCounts> rows;  // by report
  std::set<std::string> failed;           // reports that failed
  std::optional<QuotaTally> quotas;
  std::optional<report_format::DuplicateFacts> duplicates;
  std::optional<std::map<unsigned, std::string>> owners;  // names by user id, of those to be told
  std::optional<std::set<std::string>> limit_user;        // nobody else is told of
  std::optional<Growth> growth;                           // since what there is to compare with

  bool may_tell(const std::string& user) const { return !limit_user || limit_user->contains(user); }
};

RunFacts& run_facts();

// Takes over what the profile says about what may be told.
void begin_facts(const char* profile, const VLIBCSzHash* profile_hash);

// Notes the volumes of an enumeration.
void note_volumes(const VORNMountVolInfo* volumes);

// --- Incidents ----------------------------------------------------------------------------------

enum class AlreadyLogged : bool { kNo, kYes };

// Records an incident of a known kind, once for each `what`, and logs its text unless a line has
// said it already.
void record_incident(const char* kind, const std::string& what, const std::string& text,
                     AlreadyLogged logged = AlreadyLogged::kNo);

// The same of any kind; false when it was known. Servers of newer releases know more kinds.
bool add_incident(report_format::Incident incident);

// Records that a report failed; it has logged why.
void tell_failed_report(const char* name);

// From now on what the platform notices is recorded too.
void listen_for_incidents();

// Whether an incident makes sums over shares doubtful.
bool sums_are_doubtful();

}  // namespace vornreport
