// Duplicates by content over a fleet: what each of its servers has found among its own files.
#pragma once

#include <cstdint>

#include "vornreport/report_args.hpp"

namespace vornreport {

// Writes block and CSV file in the form of the groups that a server finds itself. 0 or -1 (logged).
int32_t report_fleet_content(const ReportArgs& args);

}  // namespace vornreport
