// The file age report: how long ago files were changed.
#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

int32_t file_age(ReportArgs* args);

}  // namespace vornreport
