// The run that this process makes, from taking its profile to telling its end.
#ifndef VORN_HOST_COURSE_HPP
#define VORN_HOST_COURSE_HPP

#include <ctime>
#include <optional>
#include <string>

#include "base/text_containers.hpp"
#include "mail/mail.hpp"
#include "report_format/run_state.hpp"

namespace host {

struct Course {
  std::string profile;
  std::time_t started = 0;
  report_format::RunStatus before;  // as the run before has left it
  bool is_told = false;             // how it ended
};
std::optional<Course>& course();

// From now on this process runs `profile`. The status of the run before must still stand.
void begin_course(const std::string& profile);

// What the run that goes on has found of those before it.
EarlierRuns earlier_runs(const Course& course);

// The status of a profile as it is stored; an empty one when there is none.
report_format::RunStatus stored_status(const std::string& profile);

// What can be understood of the profile's section, for a run that couldn't load it.
VLIBCSzHash readable_settings(const std::string& profile);

}  // namespace host

#endif
