#include "base/configuration.hpp"

#include <algorithm>
#include <optional>

#include "base/ctl.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

// What `read` holds; nothing is a failure to read `file`.
template <typename Content>
Content content_of(std::optional<Content> read, const std::string& file) {
  if (!read) {
    throw host_failure(file + " can't be read");
  }
  return std::move(*read);
}

void check_changed(bool is_changed, const char* file) {
  if (!is_changed) {
    throw host_failure(std::string(file) + " can't be changed");
  }
}

}  // namespace

void check_profile_name(const std::string& name) {
  if (name == "global") {
    throw Failure("\"global\" stands for the whole server and is no profile; use another name");
  }
  if (!admin::is_profile_name(name)) {
    throw host_failure("this is no profile name");
  }
}

std::vector<Section> read_profiles() {
  return content_of(admin::read_profiles(), VORN_PATH_CONFIG);
}

Section read_profile(const std::string& name) {
  if (name != "global") {
    check_profile_name(name);
  }
  if (std::optional<Section> section = admin::read_section(VORN_PATH_CONFIG, name)) {
    return std::move(*section);
  }
  throw host_failure("profile \"" + name +
                     "\" is not in " VORN_PATH_CONFIG "; see vornctl profile list");
}

bool profile_exists(const std::string& name) {
  const auto file = content_of(admin::examine_file(VORN_PATH_CONFIG), VORN_PATH_CONFIG);
  return std::any_of(file.sections.begin(), file.sections.end(),
                     [&](const Section& section) { return section.name == name; });
}

void hold_profile(const std::string& profile) {
  const std::string title = "profile \"" + profile + "\"";
  switch (admin::hold_profile(profile)) {
    case admin::Hold::taken:
      return;
    case admin::Hold::running:
      throw Failure(title + " is running; try again when its run has ended");
    case admin::Hold::failed:
      throw host_failure(title + " can't be locked");
  }
}

std::vector<Share> read_shares() {
  return content_of(admin::read_shares(), VORN_PATH_SHARES);
}

void add_section(const char* file, const std::string& name, const Changes& entries) {
  check_changed(admin::add_section(file, name, entries), file);
}

void change_section(const char* file, const std::string& name, const Changes& changes,
                    const std::string& new_name) {
  check_changed(admin::change_section(file, name, changes, new_name), file);
}

void remove_section(const char* file, const std::string& name) {
  check_changed(admin::remove_section(file, name), file);
}

}  // namespace ctl
