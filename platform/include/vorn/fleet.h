// The fleet's engine, for a run that sends its rows there and for a report over all servers.
//
// Texts belong to the fleet and live until the next call with it, or until it is closed. A fleet
// belongs to one thread.
#ifndef VORN_FLEET_H
#define VORN_FLEET_H

#include <stddef.h>

#include "vorn/text.h"

#ifdef __cplusplus
extern "C" {
#endif

typedef struct VORNFleet VORNFleet;

// Takes the configuration of VORN_PATH_FLEET into `*fleet`; nothing is asked of the engine yet. 0
// with a fleet that the caller closes; 1 without one: no engine is configured; -1 with one that is
// good for VORNFleetProblem alone: the configuration can't be worked with.
int VORNFleetOpen(VORNFleet** fleet);
// Accepts null.
void VORNFleetClose(VORNFleet* fleet);

// This server's name in the fleet.
const char* VORNFleetServer(const VORNFleet* fleet);
// What the last call that failed was up against, as a sentence without an end.
const char* VORNFleetProblem(const VORNFleet* fleet);

// How rows are written: the engine's TabSeparated and RowBinary.
typedef enum { VORN_FLEET_TEXT, VORN_FLEET_BINARY } VORNFleetFormat;
// Fills `out` with the next bytes of rows; 0 at their end.
typedef size_t (*VORNFleetSource)(void* context, char* out, size_t size);
// Adds the rows of `count` sources to `table` beside each other, compressed on their way to another
// machine; `contexts` has one for each. 0 when all of them are in their place; -1 when nobody knows
// how many are. Every wait is bounded.
int VORNFleetInsert(VORNFleet* fleet, const char* table, VORNFleetFormat format,
                    VORNFleetSource source, void* const* contexts, size_t count);

// As sqlite3_exec's callback: 0 to go on. Columns can be null; `names` is never null and holds
// nothing.
typedef int (*VORNFleetRow)(void* context, int columns, char** values, char** names);
// Runs a statement and hands its rows out one by one, all or none unless the way to the engine
// breaks meanwhile. 0, or -1.
int VORNFleetSelect(VORNFleet* fleet, const char* sql, VORNFleetRow row, void* context);

// Hands out the complete runs by server and profile, the newest first: server, profile, number,
// seconds since 1970 at which it started, seconds since the run before, 0, and 1 where rows of
// another server or profile have its number, else 0; behind them, with 1 in the place of the first
// 0, those that don't count for the clock they come from is ahead. 0, or -1; also when a node
// answers that didn't the last time: what was read in between may be of that one, which lacked some
// of it.
int VORNFleetRuns(VORNFleet* fleet, VORNFleetRow row, void* context);

// --- A report over the fleet --------------------------------------------------------------------

// Adds the `real_path_*` keys of a new report in `folder` to `*hash`, whose key `report_list` is
// set, and makes what they name: as VornQazInitRealPath does for a profile's run. 0, or -1 with one
// syslog line.
int VORNFleetReportBegin(const char* folder, VLIBCSzHash** hash);
// Ends it. 0 when a finished report is complete and on the disk; -1 when there is none, nor a part
// of one. `is_made` 0: nothing was finished.
int VORNFleetReportEnd(int is_made);

#ifdef __cplusplus
}
#endif

#endif
