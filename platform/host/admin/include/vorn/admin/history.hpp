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

}  // namespace admin
