// The driver's module name in log lines.
#pragma once

namespace vornreport {

inline constexpr char kDriverModule[] = "src/vornreport";

}  // namespace vornreport
