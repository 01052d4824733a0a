// The facts of a report over a fleet, made of those of its servers' runs.
#pragma once

#include <string>
#include <vector>

#include "facts/assemble.hpp"
#include "facts/run_facts.hpp"
#include "report_format/facts.hpp"

namespace vornreport {

struct FleetMember {
  std::string server;
  report_format::Facts facts;
};

// `name` of a server's share or volume as the fleet calls it.
std::string fleet_name(const std::string& server, const std::string& name);

// Records what the servers' reports lack, by server, for a report of the reports in `report_list`.
void take_over_incidents(const std::vector<FleetMember>& members);

// What is told of the lists is what `source.report_list` asks for and the servers' reports tell. Of
// two members of one server the first one counts where both tell the same.
report_format::Facts fleet_facts(std::vector<FleetMember> members, RunFacts& run,
                                 const FactsSource& source);

}  // namespace vornreport
