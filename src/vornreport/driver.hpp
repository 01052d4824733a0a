// The command line.
#pragma once

#include <cstdint>

// Which action the command line asked for: 0 none, 1 report, 2 data, 3 clean.
extern int32_t gACT;

namespace vornreport {

// Parses the one action, runs it and removes the run's temporary files. Always 0: failures are in
// the log and in the run status; only SIGTERM ends the process with another status.
int run(int argc, char** argv);

}  // namespace vornreport
