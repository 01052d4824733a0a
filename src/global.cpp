#include "vornreport/global.hpp"

#include "vornreport/error_log.hpp"
#include "vornreport/registry.hpp"

int VornQazGlobalCollectData(const VLIBCSzHash* profile_hash) {
  using namespace vornreport;  // NOLINT(google-build-using-namespace): exported from outside it
  if (profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED("src/global", 22, "bad parameter");
    return -1;
  }
  int result = 0;
  for (const ReportEntry& entry : report_registry()) {
    if (entry.collect != nullptr) {
      const int collected = entry.collect("global", profile_hash);
      result = collected < 0 ? collected : result;
    }
  }
  return result;
}
