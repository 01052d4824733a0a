// The registry: every report that a profile can select.
#pragma once

#include <span>

#include "vornreport/report_args.hpp"

namespace vornreport {

// Where a report takes its facts from; decides whether a run gathers file statistics.
enum class ReportSource : uint8_t { kStatistics, kSystem };

struct ReportEntry {
  char name[128];  // as it stands in `report_list`; NUL-padded
  ReportSource source;
  ReportFunction report;
  StatementFunction statement;  // null for a report that asks for none; see statements_ahead.hpp
  CollectFunction collect;      // null for a report without data of its own between runs
};

// In the order in which reports run and stand on the page.
std::span<const ReportEntry> report_registry();

// Runs one report. That it failed is told, unless there is nothing to report: without quotas on any
// volume the page says so by itself, and a volume that has them has had its own incident.
void run_report(const ReportEntry& entry, ReportArgs& args);

// A report is selected when its name occurs anywhere in the list.
bool is_selected(const ReportEntry& entry, const char* report_list);

}  // namespace vornreport
