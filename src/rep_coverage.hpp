// The coverage report: what each share's own walk saw on each volume.
#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

int32_t coverage(ReportArgs* args);

}  // namespace vornreport
