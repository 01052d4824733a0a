// The end of a run, told to those who have to know it without asking.
#ifndef VORN_HOST_TELL_HPP
#define VORN_HOST_TELL_HPP

#include <optional>

#include "base/text_containers.hpp"
#include "outcome/course.hpp"
#include "report_format/facts.hpp"

namespace host {

// A failure goes to the profile's recipients (unless its key mail_on_failure is false) and to
// standard error, with what the run has said to the log.
void tell_failure(const Course& course, const VLIBCSzHash& settings);

// What no mail has told goes to standard error: what the report lacks, what became of the runs
// before, that it is missing from the fleet, that its mail reached nobody.
void tell_report(const Course& course, const report_format::Facts& facts,
                 const VLIBCSzHash& settings, const report_format::RunStatus& status);

}  // namespace host

#endif
