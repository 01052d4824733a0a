// Sending a run to its fleet.
#pragma once

#include "vorn/text.h"

namespace vornreport {

// What rows are looked up in; as for a report.
struct ShipLookUps {
  const VLIBCSzHash* users;
  const VLIBCSzHash* volumes;
  const VLIBCSzHash* shares;
};

// Sends the run's rows, which nobody sees before ship_run(): the files of the statistics database,
// and what was kept for the fleet. What fails is tried once more and is an incident then, no
// failure of the report. Does nothing when the profile takes no part.
void ship_rows(const VLIBCSzHash* profile_hash, const ShipLookUps& look_ups);

// The report is finished: sends the run's line with the facts in `facts_path`, by which the rows
// count. Without rows that have been sent nothing is done. A failure is logged, and told by the
// run's mail and status, since its facts are closed.
void ship_run(const char* facts_path);

}  // namespace vornreport
