#include <array>

#include "actions.hpp"
#include "module.hpp"
#include "shell.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {

int correct_report_dir(const char* profile, const VLIBCSzHash* profile_hash) {
  if (is_unset(profile) || profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 94, "bad parameter");
    return -1;
  }
  const char* working = set_value(profile_hash, "real_path_date");
  const char* final_dir = set_value(profile_hash, "real_path_date_final");
  std::array<char, 8192> quoted_working{};
  std::array<char, 8192> quoted_final{};
  if (working == nullptr || final_dir == nullptr ||
      VLIBCEncShParam(working, quoted_working.data(), quoted_working.size()) < 0 ||
      VLIBCEncShParam(final_dir, quoted_final.data(), quoted_final.size()) < 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 101, "get report correct dir failed");
    return -1;
  }
  run_command(kDriverModule, 107, "/bin/mv %s %s", quoted_working.data(), quoted_final.data());
  return 0;
}

int publish_report(const char* profile, const VLIBCSzHash* profile_hash) {
  if (is_unset(profile) || profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 122, "bad parameter");
    return -1;
  }
  const char* target = set_value(profile_hash, "real_path_report_final");
  if (target == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 127, "get target file failed");
    return 0;
  }
  std::array<char, 1024> link{};
  if (VornGetTargetLink(profile_hash, target, link.data(), link.size()) < 0 ||
      is_unset(link.data())) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 131, "create share link failed");
    if (set_value(profile_hash, "mail_to") != nullptr) {
      VornQazStatusMailFailed();
    }
    return 0;
  }
  report_trace(kDriverModule, 134, "get link=%s\n\n", link.data());
  if (VornQazSendReport(profile, link.data(), profile_hash) < 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 136, "send mail failed, profile=%s", profile);
    VornQazStatusMailFailed();
  }
  return 0;
}

}  // namespace vornreport
