#include "vornreport/fleet_source.hpp"

#include <string_view>

#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

constexpr char kBoundedSum[] =
    "if(sum(toFloat64(size)) >= 9223372036854775807., toInt64(9223372036854775807), sum(size))";

void replace_all(std::string& text, std::string_view what, std::string_view with) {
  for (size_t at = 0; (at = text.find(what, at)) != std::string::npos; at += with.size()) {
    text.replace(at, what.size(), with);
  }
}

}  // namespace

bool run_over_fleet(const FleetSource& source, const char* statement, VORNFleetRow row,
                    void* context, const char* module) {
  std::string sql = statement;
  replace_all(sql, "{sum}", kBoundedSum);
  replace_all(sql, "{runs}", source.runs);
  if (VORNFleetSelect(source.fleet, sql.c_str(), row, context) == 0) {
    return true;
  }
  REPORT_LOG_ERR(module, __LINE__, "%s\n", VORNFleetProblem(source.fleet));
  return false;
}

}  // namespace vornreport
