// report.json, which may come from elsewhere.
#include "report_format/facts.hpp"

#include "fuzz.hpp"

void fuzz::one(std::string_view text) {
  if (const auto started = report_format::started_of(text)) {
    require(*started >= 0, "a start is a time");
  }
  const auto facts = report_format::facts_of(text);
  if (!facts) {
    return;
  }
  const std::string line = report_format::to_line(*facts);
  require(line.find_first_of("<\n") == line.npos, "a line fits a script element");
  const auto again = report_format::facts_of(line);
  require(again && report_format::to_line(*again) == line, "what is written is read");
  require(report_format::started_of(line) == std::optional(facts->started) || facts->started < 0,
          "both readers tell one start");
}
