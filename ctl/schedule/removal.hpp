// Ending what starts runs of a profile, whether the profile is there still or not.
#ifndef VORN_CTL_REMOVAL_HPP
#define VORN_CTL_REMOVAL_HPP

#include <string>
#include <vector>

#include "base/configuration.hpp"
#include "schedule/jobs.hpp"

namespace ctl {

// Removes the cron file that the profile's key names, if it runs nothing else. Its path, or an
// empty text when the profile has no such key. Throws a Failure when it stays.
std::string remove_cron_file(const Section& profile);

// Removes that, every other file of vornctl's that runs only this profile, and its timers. A
// profile that is gone has no keys. What was removed. Throws a Failure when something stays.
std::vector<std::string> remove_schedule(const Section& profile);

// How the job of a profile that is gone is removed.
std::string removal_of(const Job& job);

// Warns of the lines in other files that still run `profile`, which are not vornctl's to remove.
void warn_of_jobs(const std::string& profile);

}  // namespace ctl

#endif
