#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "actions.hpp"
#include "module.hpp"
#include "shell.hpp"
#include "vorn/paths.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/registry.hpp"

namespace vornreport {
namespace {

bool is_link(const char* path) {
  const int before = errno;
  struct stat status {};
  const bool result = lstat(path, &status) == 0 && S_ISLNK(status.st_mode);
  errno = before;
  return result;
}

// Sections stand in registry order, whatever the order in the list. Their number.
int build_sections(const char* report_list, const char* data_path, const char* body_path) {
  int count = 0;
  for (const ReportEntry& entry : report_registry()) {
    if (!is_selected(entry, report_list)) {
      continue;
    }
    report_trace(kDriverModule, 169, "build report=%s\n\n", entry.name);
    ++count;
    if (count == 1) {
      run_command(kDriverModule, 171, VORN_PATH_TEMPLATE_SCRIPT " header %s %s", data_path,
                  entry.name);
    }
    run_command(kDriverModule, 173, VORN_PATH_TEMPLATE_SCRIPT " body %s %s", body_path, entry.name);
  }
  return count;
}

}  // namespace

int build_report_html(const char* profile, const VLIBCSzHash* profile_hash, const char* data_path) {
  if (is_unset(profile) || profile_hash == nullptr || is_unset(data_path)) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 153, "Bad Parameter");
    return -1;
  }
  const char* report_list = set_value(profile_hash, "report_list");
  if (report_list == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 158, "No report selected");
    return -1;
  }
  FixedText<512> body;
  body.format(VORN_TMP_BODY_FORMAT, static_cast<unsigned>(getpid()));
  run_command(kDriverModule, 165, VORN_PATH_TEMPLATE_SCRIPT " body   %s", body.c_str());
  const int count = build_sections(report_list, data_path, body.c_str());
  run_command(kDriverModule, 179, VORN_PATH_TEMPLATE_SCRIPT " tail %s", body.c_str());
  run_command(kDriverModule, 182, "/bin/cat %s >> %s", body.c_str(), data_path);
  run_command(kDriverModule, 183, "/bin/rm -f %s", body.c_str());

  const char* template_dir = set_value(profile_hash, "real_path_template");
  if (template_dir == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 189, "get template dir failed");
    return -1;
  }
  const char* date_dir = set_value(profile_hash, "real_path_date");
  if (date_dir == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 194, "get target dir failed");
    return -1;
  }
  if (!is_link(template_dir)) {
    run_command(kDriverModule, 200, "/bin/rm -rf '%s'", template_dir);
    run_command(kDriverModule, 201, "/bin/cp -rfp %s '%s'", VORN_PATH_TEMPLATE, template_dir);
  }
  run_command(kDriverModule, 204, "/bin/mv %s '%s/'report.html", data_path, date_dir);
  return count;
}

}  // namespace vornreport
