// What of the facts deserves attention: the one judgement that page, mail and vornctl repeat.
#pragma once

#include <vector>

#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "report_format/facts.hpp"

namespace vornreport {

// The worst first. `facts` has all its other lists.
std::vector<report_format::Attention> attention_of(const report_format::Facts& facts,
                                                   const RunFacts& run, const Tallies& tallies);

}  // namespace vornreport
