// What the driver hands to a report, and the shape of a report.
#pragma once

#include <array>
#include <cstdint>

#include "vorn/text.h"

struct QAZLLNode;  // the platform's linked list; only the duplicate file report looks inside

namespace vornreport {

struct FleetSource;

// Filled afresh for every report, so that what a report changes does not reach the next one. The
// hashes belong to the driver and outlive the call.
struct ReportArgs {
  const char* profile;
  const VLIBCSzHash* profile_hash;  // the profile's section and its real_path_* keys
  const VLIBCSzHash* user_hash;     // user names to report on
  const VLIBCSzHash* volume_hash;   // share name to mount path of its volume
  const VLIBCSzHash* share_hash;    // share name to folder
  QAZLLNode** dup_list;             // null but inside the duplicate file report
  QAZLLNode** dup_group_list;       // null but inside the duplicate file report
  int embedded;  // non-zero: the caller writes CSV header, closing tag and CSV finishing itself
  // Null for a server's own report. Otherwise the rows come from there, and the names of shares and
  // volumes, those of the hashes included, begin with their server's.
  const FleetSource* fleet = nullptr;
};

// Appends the report's block to the report data file and writes its CSV file. 0 or -1.
using ReportFunction = int32_t (*)(ReportArgs* args);
// The statement that a report of the statistics database begins with, for a profile's section; what
// it gives lasts as long as the process.
using StatementFunction = const char* (*)(const VLIBCSzHash* profile_hash);
// Stores what a report accumulates between runs. 0 or -1.
using CollectFunction = int32_t (*)(const char* profile, const VLIBCSzHash* profile_hash);

}  // namespace vornreport
