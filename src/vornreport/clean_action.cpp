#include "actions.hpp"
#include "module.hpp"
#include "temp_files.hpp"
#include "vorn/config.h"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

// Written back as every other line of the file is; not a format of ours to choose at run time.
constexpr char kSectionLine[] = "\t%s = %s\n";
constexpr char kScheduleKey[] = "schedule_collect_id";

// Removes the profile's schedule and writes its section back when that changed it. A failure is
// logged and does not keep the rest from being cleaned.
void clean_schedule(const char* profile, HashHandle& hash) {
  const int changed = with_address(
      hash, [&](VLIBCSzHash** h) { return VornQazScheduleClean(profile, h, kScheduleKey); });
  if (changed < 0) {
    REPORT_LOG_ERR(kDriverModule, 531, "clean schedule failed, profile=%s\n", profile);
  } else if (changed == 1 && VLIBCFileSetSection(VORN_PATH_CONFIG, profile, nullptr, hash.get(),
                                                 kSectionLine) < 0) {
    REPORT_LOG_ERR(kDriverModule, 535, "VLIBCFileSetSectionValue failed.(0x%04X)\n",
                   static_cast<unsigned>(VLIBCErrGet()));
  }
}

// Negative when the profile can't be read at all, which ends the action.
int clean_profile(const char* profile) {
  HashHandle hash(VLIBCSzHashAlloc(kPlatformSlots));
  if (!hash) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 523, "malloc hash failed");
    return -1;
  }
  const int keys = with_address(
      hash, [&](VLIBCSzHash** h) { return VLIBCFileGetSection(VORN_PATH_CONFIG, profile, h); });
  if (keys < 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 525, "Get section failed, section=%s", profile);
    return -1;
  }
  clean_schedule(profile, hash);
  if (with_address(hash, [&](VLIBCSzHash** h) { return VornQazInitRealPath(profile, h, 0); }) < 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 541, "init path failed, section=%s", profile);
  } else {
    VornQazReportCleanTmp(profile, hash.get());
  }
  return 0;
}

}  // namespace

int clean_action(char** args) {
  ListHandle profiles(VLIBCSzListAlloc(kPlatformSlots));
  if (!profiles) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 513, "malloc list failed");
    return -1;
  }
  if (args != nullptr && !is_unset(args[0])) {
    with_address(profiles, [&](VLIBCSzList** l) { return VLIBCSzListPush(l, args[0]); });
  } else {
    with_address(profiles, [](VLIBCSzList** l) { return VornQazEnumProfile(l, 0); });
    clean_temp_files(1);
  }
  const int count = VLIBCSzListCount(profiles.get());
  for (int i = 0; i < count; ++i) {
    if (const int result = clean_profile(VLIBCSzListGet(profiles.get(), i)); result < 0) {
      return result;
    }
  }
  return 0;
}

}  // namespace vornreport
