// Who runs a profile.
#ifndef VORN_HOST_RUN_LOCK_HPP
#define VORN_HOST_RUN_LOCK_HPP

#include <sys/types.h>

#include <ctime>
#include <optional>
#include <string>

namespace host {

enum class TakeResult { taken, busy, failed };

enum class TakeFor { run, administration };
// Takes `profile` (a valid name) for this process; `failed` after one log line.
TakeResult take_profile(const std::string& profile, TakeFor purpose = TakeFor::run);
// Who took it last for a run, and when; nothing when nobody has, or that can't be told.
struct Taken {
  pid_t process = 0;
  std::time_t time = 0;
};
std::optional<Taken> last_taken_for_run(const std::string& profile);
// Whether this process holds `profile`.
bool holds_profile(const std::string& profile);
// Whether another live process holds `profile`; false as well when that can't be told.
bool held_by_other(const std::string& profile);

}  // namespace host

#endif
