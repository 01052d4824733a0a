// What stands beside a profile's reports for people: index.html, the list of them all, and the link
// `latest` to the newest.
#ifndef VORN_HOST_REPORT_INDEX_HPP
#define VORN_HOST_REPORT_INDEX_HPP

#include <string>

#include "vorn/base/file_io.hpp"

namespace host {

// Brings both up to date in `folder`, which belongs to `profile` alone. Something else of such a
// name, which isn't ours, stays as it is. One log line for that, and for what can't be read or
// written; no report depends on it.
void update_index(const std::string& folder, const std::string& profile) noexcept;

// Removes both from the open folder of a profile's reports, where they are ours.
void remove_index(const Fd& folder);

}  // namespace host

#endif
