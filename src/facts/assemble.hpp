// The facts of a run, made of what it has found out.
#pragma once

#include <map>
#include <string>
#include <vector>

#include "facts/run_facts.hpp"
#include "facts/snapshot.hpp"
#include "facts/tallies.hpp"
#include "report_format/facts.hpp"

namespace vornreport {

// What the facts need besides what the run has learnt.
struct FactsSource {
  std::string host, time_zone;
  int64_t now = 0;
  std::string report_list;
  bool has_walked = false;  // gathering was asked for
  // Samples by the name under which a volume is stored.
  std::map<std::string, std::vector<report_format::Sample>> samples;
  SnapshotSamples snapshots;
};

// Volumes are asked for their identifiers.
report_format::Facts assemble_facts(const RunFacts& run, const Tallies& tallies,
                                    const FactsSource& source);

// Parts of it, for facts that are made of others.
void put_pressing_first(std::vector<report_format::VolumeFacts>& volumes);
std::vector<report_format::ReportFacts> reports_of(const RunFacts& run, const FactsSource& source);

}  // namespace vornreport
