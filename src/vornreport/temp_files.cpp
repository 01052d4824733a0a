#include "temp_files.hpp"

#include <unistd.h>

#include <array>

#include "module.hpp"
#include "shell.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

void remove_all_statistics(const VLIBCSzHash* locations) {
  std::array<char, 8192> base{};
  const char* path = set_value(locations, "real_path_base");
  if (path == nullptr || VLIBCEncShParam(path, base.data(), base.size()) < 0) {
    REPORT_LOG_ERR(kDriverModule, __LINE__, "get base path failed\n");
    return;
  }
  run_command(kDriverModule, 480, "/bin/rm -f %s/%s.*", base.data(), "stat.db");
}

}  // namespace

int clean_temp_files(int all_profiles) {
  HashHandle locations(VLIBCSzHashAlloc(kPlatformSlots));
  if (!locations) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 469, "malloc hash failed");
    return -1;
  }
  if (with_address(locations, [](VLIBCSzHash** h) { return VornQazInitLocation(h, 0); }) < 0) {
    REPORT_LOG_ERR(kDriverModule, 472, "init location failed\n");
    return -1;
  }
  if (all_profiles != 0) {
    remove_all_statistics(locations.get());
  } else {
    const char* stat_db = set_value(locations.get(), "real_path_stat_db");
    if (stat_db == nullptr) {
      REPORT_LOG_ERR(kDriverModule, 484, "get db path failed\n");
      return -1;
    }
    PathText journal;
    journal.format("%s-journal", stat_db);
    unlink(stat_db);
    unlink(journal.c_str());
  }
  unlink(report_data_path().c_str());
  PathText scratch;
  scratch.format(VORN_TMP_CMD_FORMAT, static_cast<unsigned>(getpid()));
  unlink(scratch.c_str());
  return 0;
}

}  // namespace vornreport
