// Loading a report profile.
#pragma once

#include "vornreport/handles.hpp"

namespace vornreport {

// The profile's section of the configuration file, completed with its working paths. Sets the run
// status "collect_data" first. `for_report` is 1 for the report action, which then owns the paths'
// folders, else 0. Null on failure, which is logged.
HashHandle init_profile(const char* profile, int for_report);

}  // namespace vornreport
