#include "compare_limit.hpp"

#include <optional>
#include <string>

#include "facts/run_facts.hpp"
#include "module.hpp"
#include "report_format/reports.hpp"
#include "report_format/texts.hpp"
#include "report_format/values.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

constexpr char kKey[] = "duplicate_compare_minutes";

int g_minutes = 0;  // 0: no limit
bool g_is_past = false;

void tell_end(uint64_t size) {
  // Incidents are in English, whatever the page's language.
  const std::string shown = report_format::Texts(VORN_PATH_TEMPLATE "/lang", "en").size(size);
  record_incident("compare_stopped", report_format::kDuplicateFile.name,
                  "the comparison of contents reached its limit of " + std::to_string(g_minutes) +
                      (g_minutes == 1 ? " minute" : " minutes") + " at files of " + shown +
                      "; smaller ones were not compared; raise " + kKey);
}

}  // namespace

void begin_compare_limit(const VLIBCSzHash* profile_hash) {
  constexpr unsigned long long kMinute = 60;  // seconds
  const char* value = set_value(profile_hash, kKey);
  const std::optional<int> minutes =
      value != nullptr ? report_format::whole_number(value) : std::optional(0);
  if (!minutes) {
    REPORT_LOG_ERR(kDuplicateModule, __LINE__,
                   "%s \"%s\" is no whole number, so the comparison of contents has no limit; "
                   "run vornctl profile set PROFILE %s NUMBER\n",
                   kKey, value, kKey);
  }
  g_minutes = minutes.value_or(0);
  g_is_past = false;
  VornQazSetDigestDeadline(static_cast<unsigned long long>(g_minutes) * kMinute);
}

void end_compare_limit() {
  VornQazSetDigestDeadline(0);
}

bool past_compare_limit(uint64_t size) {
  if (!g_is_past && VornQazDigestDeadlinePassed() != 0) {
    g_is_past = true;
    tell_end(size);
  }
  return g_is_past;
}

}  // namespace vornreport
