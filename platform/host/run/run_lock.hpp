// Who runs a profile.
#ifndef VORN_HOST_RUN_LOCK_HPP
#define VORN_HOST_RUN_LOCK_HPP

#include <string>

namespace host {

enum class TakeResult { taken, busy, failed };

// Takes `profile` (a valid name) for this process; `failed` after one log line.
TakeResult take_profile(const std::string& profile);
// Whether this process holds `profile`.
bool holds_profile(const std::string& profile);
// Whether another live process holds `profile`; false as well when that can't be told.
bool held_by_other(const std::string& profile);

}  // namespace host

#endif
