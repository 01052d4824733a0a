// The end of a report that is no profile's.
#ifndef VORN_HOST_RUN_OUTCOME_HPP
#define VORN_HOST_RUN_OUTCOME_HPP

#include "run/run_paths.hpp"

namespace host {

// Whether the report, finished as far as `is_made` says, is whole and on the disk. Where it isn't,
// nothing of it stays.
bool end_report(const ReportRun& run, bool is_made);

}  // namespace host

#endif
