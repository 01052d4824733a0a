#include <ctime>

#include "actions.hpp"
#include "db_snapshots.hpp"
#include "facts/growth_facts.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "module.hpp"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {

bool store_snapshot(const VLIBCSzHash* profile_hash) {
  const char* report_list = set_value(profile_hash, "report_list");
  const bool has_something = !tallies().shares().empty() || run_facts().quotas;
  return report_list != nullptr && has_something &&
         SnapshotStorePending(run_facts().profile,
                              take_snapshot(run_facts(), tallies(), report_list));
}

void keep_snapshot() {
  if (!SnapshotMarkValid(run_facts().profile, run_facts().started, std::time(nullptr))) {
    REPORT_LOG_ERR_NESTED(kDriverModule, __LINE__,
                          "the snapshot of this report is lost; later reports can't tell what has "
                          "grown since");
  }
}

void drop_snapshot() {
  SnapshotDrop(run_facts().profile, run_facts().started);
}

}  // namespace vornreport
