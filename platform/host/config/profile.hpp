// Profile names.
#ifndef VORN_HOST_PROFILE_HPP
#define VORN_HOST_PROFILE_HPP

namespace host {

// Whether `profile` is a profile name (see vorn/report.h); one log line when it isn't, the
// first time. Every call that takes a name asks this before it makes a path or a text from it.
bool valid_profile(const char* profile);

}  // namespace host

#endif
