// The history of volume usage, which outlives all runs.
#pragma once

#include <ctime>
#include <string>

namespace admin {

// The number of samples of volumes that the history holds for `profile` since `start`; 0 as well
// when it can't be read.
int samples_since(const std::string& profile, std::time_t start);

// What is wrong with the history, or with the schema that a new one is made from, as the end of a
// sentence that begins with its path; empty when nothing is. A history need not be there yet.
std::string history_problem();
std::string schema_problem();

// What the history knows of `profile`, its samples and snapshots, goes. False after a message, with
// nothing changed. A history that isn't there yet knows nothing.
bool forget_history(const std::string& profile);
// The same is known of `to` from now on, and nothing else. False after a message, as above.
bool copy_history(const std::string& from, const std::string& to);

}  // namespace admin
