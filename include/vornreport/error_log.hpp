// The two channels of the program: syslog for what an operator must know, and standard output for
// the same messages and for the progress of a run.
//
// Every line carries a position: the module's name and a number. Numbers that stand as constants at
// the call are stable, so that operators can filter on them; all others are the call's own line.
#pragma once

namespace vornreport {

// Simple form. With errno set: syslog "module:line (%m)" and the message, then standard output
// "(module:line)(%m)" and the message; with errno zero the same without "(%m)". errno is left as it
// was. The format carries its own line feed.
[[gnu::format(printf, 3, 4)]] void REPORT_LOG_ERR(const char* module, int line, const char* format,
                                                  ...);

// Nested form, used by most messages: the simple form of a message that begins with its own
// "(module:line)(%m)" and ends with one more line feed. The format carries none.
[[gnu::format(printf, 3, 4)]] void REPORT_LOG_ERR_NESTED(const char* module, int line,
                                                         const char* format, ...);

// Standard output only: "(module:line)" and the text.
[[gnu::format(printf, 3, 4)]] void report_trace(const char* module, int line, const char* format,
                                                ...);

// A null argument that a caller must not pass: syslog only, and the platform's error code. The
// condition is the text of the check that failed.
void report_invalid_argument(const char* module, int line, const char* condition);

}  // namespace vornreport
