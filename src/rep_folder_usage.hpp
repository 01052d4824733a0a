// The largest folders report: each with everything below it.
#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

int32_t folder_usage(ReportArgs* args);

}  // namespace vornreport
