// Shell commands. Each runs in a process group of its own, so that SIGTERM can end what is being
// waited for with everything it started.
#pragma once

#include <cstdint>

#include "vornreport/handles.hpp"

namespace vornreport {

// Formats a command (cut at 4095 bytes: a cut one ends inside a quoted word, which the shell
// refuses), traces "run cmd=..." with the stable `line` and runs it with /bin/sh as system(3) does,
// waiting for its end; the standard streams are flushed first. One that failed or couldn't be
// started prints nothing here and skips no later step, but the run's data counts as lost.
[[gnu::format(printf, 3, 4)]] void run_command(const char* module, int line, const char* format,
                                               ...);

// How long a command may run and how much it may print before it is ended.
struct CommandLimits {
  int seconds;
  uint64_t bytes;
};

// Runs a command whose output nobody reads. Its exit status as the shell gives it; -1, logged, when
// it could not be started or was ended at its limit.
int run_limited(const char* module, const char* command, const CommandLimits& limits);

// Starts a command and gives its standard output to read, as popen(3) does. The stream ends early,
// logged, when a limit is reached, and fclose then fails; closing it awaits the command. Null when
// it could not be started.
FileHandle open_limited(const char* module, const char* command, const CommandLimits& limits);

// Ends the command that is being waited for, if any, with everything it started, and waits for its
// end for a moment. Only calls that are safe in a signal handler.
void end_running_command();

}  // namespace vornreport
