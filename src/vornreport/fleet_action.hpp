// The report over a fleet.
#pragma once

#include <string>

namespace vornreport {

struct FleetOrder {
  std::string folder;   // that gets the report's own
  std::string reports;  // as a profile's report_list
  std::string language;
  std::string servers;  // comma-separated; empty: all
};

// Makes the report, of the newest complete run of every server and profile. The path of its page;
// empty when there is none: what is wrong has a line beginning with "vornfleet: " on standard error
// then, or one in the log.
std::string fleet_report(const FleetOrder& order);

}  // namespace vornreport
