// Shell commands of the driver.
#pragma once

namespace vornreport {

// Formats a command (cut at 4095 bytes: a cut one ends inside a quoted word, which the shell
// refuses), traces "run cmd=..." with the stable `line` and runs it with /bin/sh as system(3) does,
// waiting for its end; the standard streams are flushed first. The exit status is not looked at:
// what a command should have left behind is judged by the finished page.
[[gnu::format(printf, 2, 3)]] void run_command(int line, const char* format, ...);

// Ends the command that run_command is waiting for, if any, with everything it started, and waits
// for its end for a moment. Only calls that are safe in a signal handler.
void end_running_command();

}  // namespace vornreport
