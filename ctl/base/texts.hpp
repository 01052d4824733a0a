// How sizes, times and states are written on a terminal.
#ifndef VORN_CTL_TEXTS_HPP
#define VORN_CTL_TEXTS_HPP

#include <cstdint>
#include <ctime>
#include <string>

#include "report_format/texts.hpp"
#include "vorn/admin/runs.hpp"

namespace ctl {

const char* word_for(admin::RunState state);
// What is said of a profile whose last report's mail reached nobody.
std::string unsent_mail(const std::string& profile);
// What is said of one whose last report was finished, but not taken by the fleet.
std::string missing_from_fleet(const std::string& profile);
// What is said of a profile whose report was due at `due`; `begun`: the last run, 0 when there was
// none.
std::string overdue_text(std::time_t begun, std::time_t due);
// What reports say, as it stands in their dictionaries.
const report_format::Texts& english();
std::string size_text(std::uint64_t bytes);  // "1.5 GiB", as in them
std::string time_text(std::time_t time);     // "2026-11-21 04:00", local
std::string json_time(std::time_t time);     // "2026-11-21T04:00:00+0100"

}  // namespace ctl

#endif
