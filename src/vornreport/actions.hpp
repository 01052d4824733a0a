// The three actions of the command line. Each takes the arguments behind the option (element 0 is
// the profile name, a null pointer ends them) or null; main ignores the results.
#pragma once

#include "report_format/facts.hpp"
#include "vorn/text.h"
#include "vornreport/fixed_text.hpp"

namespace vornreport {

// Gathers and produces one report. 0 when it was made or the profile is already running, else -1.
int report_action(char** args);
// Collects what accumulates over time; null stands for the profile "global". The number of
// selected reports, 0, or -1.
int collect_action(char** args);
// Removes the schedule and temporary state of one profile, or of all. 0, or negative when it
// stopped early.
int clean_action(char** args);

// Steps of the report action.

// Starts the report data file, gathers and runs the selected reports; writes the data file's path
// into `out_path`. The number of reports run minus one, or -1.
int create_report_data(const char* profile, const VLIBCSzHash* profile_hash, char* out_path,
                       int out_size);
// Stores what the run has counted, for later ones to compare with; it counts from keep_snapshot().
// False when there is nothing to store, or (logged, and an incident) it can't be stored.
bool store_snapshot(const VLIBCSzHash* profile_hash);
// The report is finished: what was stored counts (logged when not).
void keep_snapshot();
// The run has failed: what was stored goes.
void drop_snapshot();
// Closes the facts of the run: writes them as a block of the data file and as report.json into the
// dated working folder. False, logged, when a part of that failed; the run's data is lost then.
bool close_facts(const VLIBCSzHash* profile_hash, const char* data_path);
// Writes facts as the block and as the file in the folder. False, logged, when not both are there.
bool write_facts(const report_format::Facts& facts, const char* date_dir, const char* data_path);
// Completes the page and moves it into the dated working folder. The number of selected reports;
// 0 when none is known; -1 on failure.
int build_report_html(const char* profile, const VLIBCSzHash* profile_hash, const char* data_path);
// Gives the working folder its final name. 0 when the command was run, else -1.
int correct_report_dir(const char* profile, const VLIBCSzHash* profile_hash);
// Makes the share link and mails it. -1 only for bad arguments.
int publish_report(const char* profile, const VLIBCSzHash* profile_hash);

}  // namespace vornreport
