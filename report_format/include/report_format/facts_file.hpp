// The file of facts in the folder of a finished report.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "report_format/facts.hpp"

namespace report_format {

// Nothing when the report has no such file (a link is none), or a damaged one.
std::optional<Facts> read_facts(const std::string& report_folder);
// Of the report in the open folder.
std::optional<Facts> read_facts(int report_folder);

// When the run of the report in the open folder began; nothing when its facts don't tell. Reads
// only their beginning.
std::optional<std::int64_t> read_started(int report_folder);

}  // namespace report_format
