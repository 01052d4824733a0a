#include "profile.hpp"

#include "module.hpp"
#include "vorn/config.h"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"

namespace vornreport {

HashHandle init_profile(const char* profile, int for_report) {
  if (is_unset(profile)) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 297, "bad parameter");
    return nullptr;
  }
  report_trace(kDriverModule, 299, "init profile name=%s\n\n", profile);
  if (VornQazStatusUpdate(profile, "collect_data") < 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 302, "update status=%s failed", "collect_data");
    return nullptr;
  }
  HashHandle hash(VLIBCSzHashAlloc(kPlatformSlots));
  if (!hash) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 305, "malloc hash failed");
    return nullptr;
  }
  const int keys = with_address(
      hash, [&](VLIBCSzHash** h) { return VLIBCFileGetSection(VORN_PATH_CONFIG, profile, h); });
  if (keys <= 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 309, "Get section failed, section=%s", profile);
    return nullptr;
  }
  const int paths = with_address(
      hash, [&](VLIBCSzHash** h) { return VornQazInitRealPath(profile, h, for_report); });
  if (paths < 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 313, "init path failed, section=%s", profile);
    return nullptr;
  }
  return hash;
}

}  // namespace vornreport
