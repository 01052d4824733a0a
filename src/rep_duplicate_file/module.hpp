// The report's module name in log lines.
#pragma once

namespace vornreport {

inline constexpr char kDuplicateModule[] = "src/rep_duplicate_file";

}  // namespace vornreport
