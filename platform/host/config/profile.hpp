// Names of profiles and of their schedules.
#ifndef VORN_HOST_PROFILE_HPP
#define VORN_HOST_PROFILE_HPP

#include <string>
#include <string_view>

namespace host {

// Whether `profile` is a profile name (see vorn/report.h); one log line when it isn't, the
// first time. Every call that takes a name asks this before it makes a path or a text from it.
bool valid_profile(const char* profile);

// Whether `id` is a schedule identifier: 1 to 64 of A-Z a-z 0-9 _ - (cron leaves out files with
// other characters in their names).
bool valid_schedule_id(std::string_view id);
// The cron file of a schedule.
std::string schedule_file(const std::string& id);

}  // namespace host

#endif
