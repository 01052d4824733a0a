// Files that nobody answers for: a mount whose server or daemon hangs blocks whoever looks at it,
// without an end and beyond the reach of signals.
#ifndef VORN_HOST_SILENCE_HPP
#define VORN_HOST_SILENCE_HPP

#include <chrono>
#include <string>

namespace host {

// Whether a first look at `path` (what it is, and its file system) comes to no end. The look is a
// child process's; one that hangs is left to itself, with nothing of this process's open. The
// answer is kept for the life of the process, so each path may cost the time limit once.
bool is_silent(const std::string& path);

// As is_silent(), with a limit and without keeping the answer.
bool looks_silent(const std::string& path, std::chrono::milliseconds limit);

}  // namespace host

#endif
