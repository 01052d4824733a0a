// What has grown in the profile's shares since earlier reports.
#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

// Compares what gathering has counted with the profile's snapshots, and notes the growth for the
// facts. 0; -1, logged, when the snapshots can't be read or a file can't be written.
int32_t growth(ReportArgs* args);

}  // namespace vornreport
