// The end of a run by SIGTERM: one message to each channel, the run's files removed, status 1.
//
// The handler can hit inside syslog(), printf() or malloc() of the main program, whose locks it
// would wait for for ever. So everything is prepared beforehand and the handler makes only calls
// that are safe in one.
#pragma once

namespace vornreport {

// Installs sigterm_handler for `signo`, and prepares what it needs. The result of sigaction.
int setup_signal(int signo);

// Does nothing for any other signal than SIGTERM; else never returns.
void sigterm_handler(int signo);

// A statistics database to remove, with its journal, and the profile whose progress is told, when
// SIGTERM ends the run; null for none.
void remove_when_terminated(const char* stat_db, const char* profile);

}  // namespace vornreport
