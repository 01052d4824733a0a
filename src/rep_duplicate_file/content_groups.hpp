// Groups of files with equal content, found size bucket by size bucket and written at once.
#pragma once

#include "candidate.hpp"
#include "report_format/reports.hpp"
#include "vorn/list.h"
#include "vorn/text.h"

namespace vornreport {

// The page shows this many groups; the CSV file all.
inline constexpr int kMostDataGroups = static_cast<int>(report_format::kDuplicateFile.page_limit);

// Begin and end the groups of one report: what it finds goes to the facts. The profile's time limit
// holds from the begin on.
void begin_content_groups(const VLIBCSzHash* profile_hash);
void end_content_groups();

// Whether more groups may follow those of this call; when not, block and CSV file are closed.
enum class GroupsAre : int { kContinued = 0, kComplete = 1 };

// Finds the groups of the collected size bucket, writes them to the page and the CSV file, and
// releases both lists. Once the time limit is reached it does nothing but the latter; a bucket in
// work then gives the groups that its digests tell. 0, also for an empty bucket; -1 (logged) when
// the samples could not be read.
int handle_size_bucket(const VLIBCSzHash* profile_hash, QAZLLNode** groups, QAZLLNode** candidates);

// Appends groups to the report data file, numbered through the process, up to number `limit`. The
// next group's number, or -1 (logged).
int write_data_groups(const QAZLLNode* groups, int limit, GroupsAre close);

// Appends groups to the CSV file. 0 or -1 (logged).
int write_csv_groups(const VLIBCSzHash* profile_hash, const QAZLLNode* groups, GroupsAre close);

}  // namespace vornreport
