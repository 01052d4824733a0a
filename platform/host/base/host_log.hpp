// The platform's log lines.
#ifndef VORN_HOST_LOG_HPP
#define VORN_HOST_LOG_HPP

#include <string>
#include <vector>

namespace host {

// One line to syslog (LOG_ERR) that says what is wrong and what to do. Names from disk may go in as
// they are: control characters come out as '?', so that a problem is always one line. errno stays.
[[gnu::format(printf, 1, 2)]] void log_line(const char* format, ...);

// What this process has said to the system log, the program's lines included: the first ones and
// the last, with one that counts those between.
std::vector<std::string> lines_said();

// From now on lines go to `sink`, for programs that show them themselves. Where they went before.
using LogSink = void (*)(const char* line);
LogSink redirect_log(LogSink sink);

}  // namespace host

#endif
