// Profile names and the list of profiles.
#include "config/profile.hpp"

#include <algorithm>
#include <cerrno>
#include <exception>
#include <set>
#include <string>
#include <string_view>

#include "base/host_log.hpp"
#include "base/text_containers.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/config.h"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace host {
namespace {

constexpr std::size_t kLongestName = 64;

bool only(std::string_view text, std::string_view extra) {
  return !text.empty() && text.size() <= kLongestName &&
         std::all_of(text.begin(), text.end(), [extra](char c) {
           return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
                  extra.find(c) != std::string_view::npos;
         });
}

// Whether this is the first time: a run asks for its profile several times.
bool is_news(const char* bad_name) noexcept try {
  static std::set<std::string> told;
  return told.insert(bad_name).second;
} catch (const std::exception&) {
  return true;
}

int enum_profiles(VLIBCSzList& list) {
  VLIBCSzList all;
  VLIBCSzList* sections = &all;
  if (VLIBCFileEnumSection(VORN_PATH_CONFIG, &sections) < 0) {
    return -1;
  }
  int count = 0;
  for (const std::string& name : all.texts) {
    if (name != "global") {
      list.texts.push_back(name);
      ++count;
    }
  }
  return count;
}

}  // namespace

bool valid_profile(const char* profile) {
  if (profile != nullptr && *profile != '.' && only(profile, "._-")) {
    return true;
  }
  const char* shown = profile == nullptr ? "" : profile;
  if (is_news(shown)) {
    log_line(
        "\"%.80s\" is no profile name; use 1 to 64 of A-Z a-z 0-9 . _ -, not beginning with a "
        "dot",
        shown);
  }
  errno = EINVAL;
  return false;
}

bool valid_schedule_id(std::string_view id) {
  return only(id, "_-");
}

std::string schedule_file(const std::string& id) {
  return VORN_PATH_CRON "/vornreport-" + id;
}

}  // namespace host

int VornQazEnumProfile(VLIBCSzList** list, int flags) {
  if (list == nullptr || *list == nullptr || flags != 0) {
    return -1;
  }
  try {
    return host::enum_profiles(**list);
  } catch (const std::exception&) {
    return -1;
  }
}
