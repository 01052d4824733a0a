// The run's temporary files.
#pragma once

namespace vornreport {

// Removes this process's report data file and command scratch file, and the statistics database
// that belongs to no profile with its journal. With `all_profiles` non-zero: every profile's
// statistics database instead. A missing file is no error. 0, or -1 when the places can't be told.
int clean_temp_files(int all_profiles);

}  // namespace vornreport
