#include "vornreport/global.hpp"

#include "rep_volume_usage.hpp"
#include "vornreport/error_log.hpp"

int VornQazGlobalCollectData(const VLIBCSzHash* profile_hash) {
  using namespace vornreport;  // NOLINT(google-build-using-namespace): exported from outside it
  if (profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED("src/global", 22, "bad parameter");
    return -1;
  }
  return volume_usage_collect_data("global", profile_hash);
}
