// What monitoring gets to know of a profile: a file in the text format of Prometheus, for the
// textfile collector of its node exporter.
#ifndef VORN_HOST_METRICS_HPP
#define VORN_HOST_METRICS_HPP

#include <optional>
#include <string>

#include "base/text_containers.hpp"
#include "report_format/facts.hpp"
#include "report_format/run_state.hpp"

namespace host {

// The metrics of a profile whose last report run has ended as `status` says; `facts` are those of
// its newest report, `with_users` lets users' quotas be among them.
std::string metrics_text(const std::string& profile, const report_format::RunStatus& status,
                         const std::optional<report_format::Facts>& facts, bool with_users);

// Puts them in the place of the profile's metrics_file, if it has one: atomically, readable for
// everyone, and whatever others have put there. A log line when that fails.
void write_metrics(const std::string& profile, const VLIBCSzHash& settings,
                   const report_format::RunStatus& status,
                   const std::optional<report_format::Facts>& facts);

// Why `value` can't be a metrics_file, as the end of a sentence that begins with it, or nothing.
const char* metrics_file_error(std::string_view value);
// What keeps such a file from being written, with a remedy; empty when nothing does.
std::string metrics_file_problem(const std::string& value);

}  // namespace host

#endif
