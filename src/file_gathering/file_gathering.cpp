#include "file_gathering.hpp"

#include <malloc.h>

#include <cerrno>
#include <cstdio>
#include <string>

#include "facts/progress.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "index_import.hpp"
#include "module.hpp"
#include "share_overlap.hpp"
#include "share_walk.hpp"
#include "transaction.hpp"
#include "vorn/report.h"
#include "vorn/share.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

struct Gathering {
  ListHandle shares;
  HashHandle file_types;
  SqliteHandle db;
};

// False, logged, when anything is missing.
bool prepare(Gathering& gathering, const VLIBCSzHash* profile_hash) {
  gathering.shares.reset(VLIBCSzListAlloc(kPlatformSlots));
  if (!gathering.shares) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "malloc list failed");
    return false;
  }
  gathering.file_types.reset(VLIBCSzHashAlloc(kPlatformSlots));
  if (!gathering.file_types) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "malloc hash failed");
    return false;
  }
  if (with_address(gathering.file_types, VornQazInitFileTypeHash) < 0) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "init file type hash failed");
    return false;
  }
  const auto enumerate = [](VLIBCSzList** l) { return VORNShareEnum(l, VORN_SHARE_ENUM_ALL); };
  if (with_address(gathering.shares, enumerate) < 0) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "enum share failed");
    return false;
  }
  gathering.db = VORNReportDBInit(profile_hash);
  if (!gathering.db) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "open db failed");
    return false;
  }
  return true;
}

// What goes into the database meanwhile is counted for this share.
class CountedShare {
 public:
  CountedShare(const char* share, const char* path) {
    tallies().begin_share(share, path, run_facts().started);
    progress_share(share);
  }
  ~CountedShare() { tallies().end_share(); }
  CountedShare(const CountedShare&) = delete;
  CountedShare& operator=(const CountedShare&) = delete;
};

void tell_missing(const std::string& share) {
  record_incident("share_missing", share,
                  "share " + share +
                      " is missing from the report: its folder can't be read, or lies on a file "
                      "system that is not walked; the log says which",
                  AlreadyLogged::kYes);
}

void tell_refused_index(const std::string& share) {
  tallies().begin_share_again();
  record_incident("index_refused", share,
                  "the file index of share " + share +
                      " can't be used, so its folders were walked; the log says why",
                  AlreadyLogged::kYes);
}

// `found`: its top folder could be read.
void tell_walk(ShareTally& share, bool found) {
  if (!found) {
    share.missing();
  }
  if (share.is_missing()) {
    tell_missing(share.name());
  } else if (!share.is_whole()) {
    const std::string count = std::to_string(share.unreadables());
    record_incident("share_part", share.name() + ": " + count,
                    "files or folders of share " + share.name() + " can't be read: " + count +
                        "; the log names them",
                    AlreadyLogged::kYes);
  }
}

// True when the share was walked, false when it was skipped or came from its index.
bool gather_share(const Gathering& gathering, const char* share, const VLIBCSzHash* profile_hash) {
  if (is_unset(share)) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "cannot get share name");
    return false;
  }
  // So that progress and log lines stand in order when standard output is a pipe.
  std::fflush(nullptr);
  if (VornQazMatchShare(profile_hash, share) == 0) {
    return false;
  }
  PathText path;
  if (VORNSharePathGet(share, path.data(), PathText::size()) < 0) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "cannot get share path, share=%s", share);
    const CountedShare counted(share, "");
    tallies().share()->missing();
    tell_missing(share);
    return false;
  }
  const CountedShare counted(share, path.c_str());
  sqlite3* db = gathering.db.get();
  const VLIBCSzHash* types = gathering.file_types.get();
  if (VORNShareFileIndexIsEnabled(share) != 0) {
    report_trace(kGatheringModule, __LINE__, "use file index db, share=%s\n", share);
    tallies().share()->others_count(note_index_share(share));
    if (ReportFileIndexImport(share, path.c_str(), db, types) >= 0) {
      count_index_folders(share, path.c_str(), db);
      return false;
    }
    tell_refused_index(share);
  }
  report_trace(kGatheringModule, __LINE__, "stat share=%s\n", share);
  begin_transaction(db);
  const bool found = ReportShareWalk(db, share, path.c_str(), types) == 0;
  commit_transaction(db);
  tell_walk(*tallies().share(), found);
  return true;
}

// Where the shares lie that are going to be gathered; what is wrong with one is told at its turn.
void note_selected_shares(const Gathering& gathering, const VLIBCSzHash* profile_hash) {
  const int before = errno;
  forget_share_folders();
  const int count = VLIBCSzListCount(gathering.shares.get());
  for (int i = 0; i < count; ++i) {
    const char* share = VLIBCSzListGet(gathering.shares.get(), i);
    PathText path;
    if (!is_unset(share) && VornQazMatchShare(profile_hash, share) != 0 &&
        VORNSharePathGet(share, path.data(), PathText::size()) >= 0) {
      add_share_folder(share, path.c_str());
    }
  }
  add_mounted_folders();
  errno = before;
}

}  // namespace

int file_gathering(const char* profile, const VLIBCSzHash* profile_hash) {
  if (is_unset(profile) || profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "Bad Parameter");
    return -1;
  }
  forget_gathered();
  Gathering gathering;
  if (!prepare(gathering, profile_hash)) {
    return -1;
  }
  remember_gathered(profile_hash);
  report_trace(kGatheringModule, __LINE__, "stat start\n\n");
  std::fflush(nullptr);
  note_selected_shares(gathering, profile_hash);
  int walked = 0;
  const int count = VLIBCSzListCount(gathering.shares.get());
  for (int i = 0; i < count && !report_data_lost(); ++i) {
    if (gather_share(gathering, VLIBCSzListGet(gathering.shares.get(), i), profile_hash)) {
      ++walked;
    }
  }
  malloc_trim(0);  // what the walk's threads have left is room for the reports' sorting
  report_trace(kGatheringModule, __LINE__, "stat complete\n\n");
  std::fflush(nullptr);
  return walked;
}

}  // namespace vornreport
