// How much of their quota users have used, on each volume, from the system's quota tool.
#pragma once

#include <cstdint>
#include <cstdio>
#include <map>
#include <string>

#include "facts/run_facts.hpp"
#include "report_format/reports.hpp"
#include "vorn/list.h"
#include "vornreport/fixed_text.hpp"
#include "vornreport/report_args.hpp"

namespace vornreport {

// One line of the tool's user table.
struct QuotaUser {
  std::string name;  // 127 bytes at most
  uint64_t used;     // KiB
  uint64_t quota;    // KiB, the soft limit; 0: none
};

// The users of a volume by usage; those of equal usage in the tool's order. Only users of the
// filter can be shown, and of those the smallest 100, so no more are kept.
using QuotaUsers = std::multimap<uint64_t, QuotaUser>;
inline constexpr size_t kMostQuotaUsers = report_format::kQuotaUsage.page_limit;

struct QuotaVolume {
  FixedText<16> name;    // mount path, cut at 15 bytes
  uint64_t totalKiB;     // size of the volume
  uint64_t maxQuota;     // KiB: the largest quota seen; totalKiB from the first user without one
  uint64_t maxUserUsed;  // KiB: the largest usage of a user in the filter
  QuotaUsers users;
  uint64_t filteredUsers;  // of which `users` are the smallest
  QuotaTally tally;        // of those of them that may be told of
  std::string fleet_name;  // of a server of the fleet: "server:/path"; `name` is empty then
};

// The volume of a list element.
inline QuotaVolume* quota_volume_of(const QAZLLNode* element) {
  return static_cast<QuotaVolume*>(element->data);
}

// The report. 0 when the blocks were written, else -1.
int32_t quota_usage(ReportArgs* args);

// Runs the tool over all volumes. 0 when at least one was added to the list, else -1.
int32_t QuotaUsageGetData(const char* profile, const VLIBCSzHash* profileHash, QAZLLNode** list,
                          const VLIBCSzHash* userHash);

// Reads one tool output into a new volume of the list. The index of the field reached in the last
// user line; negative for bad arguments or when there was no user line (the volume is added all the
// same).
int32_t QuotaUsageParse(FILE* stream, QAZLLNode** list, const char* volumePath, uint64_t totalKiB,
                        const VLIBCSzHash* userHash);

// Puts a user behind all whose usage isn't larger, and drops the largest beyond kMostQuotaUsers.
void QuotaUserInsert(QuotaUsers& users, QuotaUser user);

// Appends both blocks to the report data file. 0 or -1.
int32_t QuotaUsageWrite(const char* profile, const VLIBCSzHash* profileHash, const QAZLLNode* list,
                        const VLIBCSzHash* userHash);

// Frees a volume: the release function of a volume list.
void QuotaFreeVolume(void* volume);

}  // namespace vornreport
