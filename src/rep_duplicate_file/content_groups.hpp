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
// holds from the begin on. `threads` read files ahead: 0 for as many as give speed, or a fixed
// number.
void begin_content_groups(const VLIBCSzHash* profile_hash, unsigned threads = 0);
void end_content_groups();
// In place of the end, when the rows failed: what waits is dropped, and the facts get nothing.
void abandon_content_groups();

// Whether more groups may follow those of this call; when not, block and CSV file are closed.
enum class GroupsAre : int { kContinued = 0, kComplete = 1 };

// Takes over a collected size bucket, finds its groups, writes them to the page and the CSV file,
// and releases both lists. Where more buckets follow (kContinued), a small one may wait for them,
// since many are read faster than few; they stay in order. Once the time limit is reached it does
// nothing but release; buckets in work then give the groups that their digests tell. 0, also for an
// empty bucket; -1 (logged) when samples could not be read.
int handle_size_bucket(const VLIBCSzHash* profile_hash, QAZLLNode** groups, QAZLLNode** candidates,
                       GroupsAre groups_are = GroupsAre::kComplete);

// Appends groups to the report data file, numbered through the process, up to number `limit`. The
// next group's number, or -1 (logged).
int write_data_groups(const QAZLLNode* groups, int limit, GroupsAre close);

// Appends groups to the CSV file. 0 or -1 (logged).
int write_csv_groups(const VLIBCSzHash* profile_hash, const QAZLLNode* groups, GroupsAre close);

}  // namespace vornreport
