// The systemd timers of profiles: which are enabled, and the files that make them run at other
// times and let their services write elsewhere.
#ifndef VORN_CTL_TIMERS_HPP
#define VORN_CTL_TIMERS_HPP

#include <string>
#include <vector>

#include "base/configuration.hpp"
#include "schedule/jobs.hpp"

namespace ctl {

// Has systemd run the profile at `times` (cron's fields), from now on and after each start of the
// machine. Throws a Failure, also when a service could not write where the profile's reports and
// metrics go.
void set_timer(const Section& profile, JobKind kind, const std::string& times);

// Disables the profile's timers and removes what vornctl has written for them; what others have
// written stays. The timers' names.
std::vector<std::string> remove_timers(const std::string& profile);

// Lets the services of a profile that has a timer write where its reports and metrics go now.
void refresh_services(const Section& profile);

// What keeps the service of the profile's report timer from writing where it shall, each with a
// remedy. Nothing where systemd doesn't run.
std::vector<std::string> service_problems(const Section& profile);

// Whether systemd runs this machine.
bool systemd_runs();
// Whether it has started a timer.
bool is_active(const std::string& timer);

}  // namespace ctl

#endif
