// What a run keeps for its fleet besides the files of its statistics database: the rows of the
// reports that are made of something else, in a file without a name, so that they take no memory
// and nobody has to remove them. Without a fleet nothing is kept, and each call costs nothing.
#pragma once

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "vorn/text.h"

namespace vornreport {

// From now on rows are kept if the profile takes part.
void begin_fleet_rows(const VLIBCSzHash* profile_hash);
bool keeps_fleet_rows();

// The next row of a report.
void keep_fleet_row(const char* report, const std::vector<std::string>& values);
// The next member of a group of files of equal content; groups are numbered as they come.
void keep_content_member(bool begins_group, const char* share, const char* path, uint64_t size,
                         int64_t mtime);

// What was kept, to be read from its start: a line for each row, without what it shares with the
// run's other rows. Null, after a log line, when not all of it could be.
FILE* kept_report_rows();
FILE* kept_content_members();

}  // namespace vornreport
