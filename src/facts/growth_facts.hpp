// Growth as the facts of a run tell it, and the snapshot that a run leaves for later ones.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "facts/growth.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "report_format/facts.hpp"

namespace vornreport {

// What the run has counted, with all folders that gathering kept. Names stand in it only where the
// selected reports may tell them: owners with file_owner, unless accounts couldn't be looked up,
// types with file_group, quotas with quota_usage.
Snapshot take_snapshot(const RunFacts& run, const Tallies& tallies, const std::string& report_list);

// What has grown on a volume since the longest time that there is a snapshot of.
struct VolumeGrowth {
  int64_t since = 0;
  int64_t bytes = 0;                         // of all shares that can be compared; less: negative
  std::vector<report_format::Cause> causes;  // what has grown the most, at most 5
};
// Nothing when there is nothing to compare with. `volume`: its mount path.
//
// Owners are summed up over the shares. A folder is a cause unless one below it accounts for nine
// tenths of its growth; of a share on several volumes no folder is one, because a folder's size
// holds what is mounted below it.
std::optional<VolumeGrowth> growth_on(const Growth& growth, const std::string& volume);

// What is told of a volume: so much of what fills it, and of what grew.
inline constexpr size_t kMostCauses = 5;

// The shares and owners that take the most on the volume, the greatest first; owners only of
// `names`.
std::vector<report_format::Cause> filled_by(const Tallies& tallies,
                                            const std::map<unsigned, std::string>* names,
                                            const std::string& volume);

// Fills in `grown` of shares, owners and types.
void add_grown(report_format::Facts& facts, const Growth& growth);

// Fills in the samples of shares and the forecasts of quotas, from what earlier runs saw and this
// one, and puts the most pressing user first.
void add_samples(report_format::Facts& facts, const SnapshotSamples& samples, const RunFacts& run);

}  // namespace vornreport
