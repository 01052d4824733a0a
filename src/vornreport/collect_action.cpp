#include <string_view>

#include "actions.hpp"
#include "module.hpp"
#include "profile.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/global.hpp"
#include "vornreport/registry.hpp"

namespace vornreport {

int collect_action(char** args) {
  const char* profile = args == nullptr ? "global" : args[0];
  if (is_unset(profile)) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 409, "bad parameter");
    return -1;
  }
  if (VornQazProfileRunning(profile) != 0) {
    report_trace(kDriverModule, 413, "profile=%s is running, skip running again\n", profile);
    return 0;
  }
  const HashHandle hash = init_profile(profile, 0);
  if (!hash) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 420, "init profile failed, profile=%s", profile);
    return -1;
  }
  if (std::string_view(profile) == "global") {
    if (VornQazGlobalCollectData(hash.get()) < 0) {
      REPORT_LOG_ERR_NESTED(kDriverModule, 425, "collect global data failed");
      return -1;
    }
    return 0;
  }
  const char* report_list = set_value(hash.get(), "report_list");
  if (report_list == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 433, "No report selected");
    return -1;
  }
  report_trace(kDriverModule, 436, "report list=%s\n\n", report_list);
  int selected = 0;
  for (const ReportEntry& entry : report_registry()) {
    if (!is_selected(entry, report_list)) {
      continue;
    }
    ++selected;
    if (entry.collect != nullptr) {
      entry.collect(profile, hash.get());
    }
  }
  VornQazStatusUpdate(profile, "success");
  return selected;
}

}  // namespace vornreport
