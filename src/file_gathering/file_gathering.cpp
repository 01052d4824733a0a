#include "file_gathering.hpp"

#include <cstdio>

#include "index_import.hpp"
#include "module.hpp"
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
    return false;
  }
  sqlite3* db = gathering.db.get();
  const VLIBCSzHash* types = gathering.file_types.get();
  if (VORNShareFileIndexIsEnabled(share) != 0) {
    report_trace(kGatheringModule, __LINE__, "use file index db, share=%s\n", share);
    if (ReportFileIndexImport(share, path.c_str(), db, types) >= 0) {
      return false;
    }
  }
  report_trace(kGatheringModule, __LINE__, "stat share=%s\n", share);
  begin_transaction(db);
  ReportShareWalk(db, share, path.c_str(), types);
  commit_transaction(db);
  return true;
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
  int walked = 0;
  const int count = VLIBCSzListCount(gathering.shares.get());
  for (int i = 0; i < count && !report_data_lost(); ++i) {
    if (gather_share(gathering, VLIBCSzListGet(gathering.shares.get(), i), profile_hash)) {
      ++walked;
    }
  }
  report_trace(kGatheringModule, __LINE__, "stat complete\n\n");
  std::fflush(nullptr);
  return walked;
}

}  // namespace vornreport
