// Where a report over a fleet has its rows from: the engine, in place of the statistics database.
#pragma once

#include <string>

#include "vorn/fleet.h"
#include "vornreport/handles.hpp"

namespace vornreport {

using FleetHandle = std::unique_ptr<VORNFleet, ReleaseWith<&VORNFleetClose>>;

struct FleetSource {
  VORNFleet* fleet;
  // A condition over the columns server, profile and run: the runs that the report is made of.
  std::string runs;
};

// Statements over the fleet say {runs} where this condition stands, and {sum} for a sum of sizes
// that stays at the greatest number, as that of the statistics database does.
//
// Runs one and hands each row to `row`, as run_statement() does. False, logged, when it failed.
bool run_over_fleet(const FleetSource& source, const char* statement, VORNFleetRow row,
                    void* context, const char* module);

}  // namespace vornreport
