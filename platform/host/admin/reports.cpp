#include "vorn/admin/reports.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "admin/section_hash.hpp"
#include "base/host_log.hpp"
#include "report_format/reports.hpp"
#include "run/link.hpp"
#include "run/old_reports.hpp"
#include "run/report_index.hpp"
#include "run/run_paths.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace admin {
namespace {

std::string text_or_empty(const char* text) {
  return text == nullptr ? "" : text;
}

}  // namespace

std::optional<std::string> report_folder(const Section& profile) {
  const auto dir = host::report_dir(profile.name.c_str(), hash_of(profile));
  return dir ? std::optional(*dir + "/" + profile.name) : std::nullopt;
}

std::optional<std::vector<StoredReport>> stored_reports(const std::string& folder,
                                                        ReportSize size) {
  const auto found =
      host::stored_reports(folder, size == ReportSize::measured ? host::ReportSize::measured
                                                                : host::ReportSize::left_out);
  if (!found) {
    return std::nullopt;
  }
  std::vector<StoredReport> reports(found->size());
  std::transform(found->begin(), found->end(), reports.begin(), [&](const auto& report) {
    return StoredReport{report.name, folder + "/" + report.name + "/" + report_format::kPageFile,
                        report.made, report.is_whole, report.size};
  });
  return reports;
}

bool remove_report(const std::string& folder, const std::string& name) {
  return host::remove_report(folder, name);
}

void update_index(const std::string& folder) {
  host::update_index(folder, folder.substr(folder.rfind('/') + 1));  // which is its profile's name
}

bool remove_all_reports(const std::string& folder) {
  const auto reports = host::stored_reports(folder, host::ReportSize::left_out);
  const auto is_gone = [&](const host::StoredReport& report) {
    return !report.is_whole || host::remove_report(folder, report.name);
  };
  if (!reports || !std::all_of(reports->begin(), reports->end(), is_gone)) {
    return false;
  }
  const host::Fd opened = host::open_report_folder(folder);  // not what its name leads to by then
  if (opened) {
    host::remove_index(opened);
  }
  const std::string page_parts = "/proc/self/fd/" + std::to_string(opened.get()) + "/template";
  if ((opened && !host::remove_tree(page_parts)) ||
      (rmdir(folder.c_str()) != 0 && errno != ENOENT)) {
    const bool holds_more = errno == ENOTEMPTY || errno == EEXIST;
    host::log_line("%s stays: %s", folder.c_str(),
                   holds_more ? "it holds more than reports" : std::strerror(errno));
  }
  return true;
}

bool move_reports(const std::string& folder, const std::string& to) {
  const host::Fd opened = host::open_report_folder(folder);
  if (!opened) {
    return errno == ENOENT;
  }
  // Above it, too, nobody else can put something in its place.
  if (renameat2(AT_FDCWD, folder.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) {
    update_index(to);  // it names the profile
    return true;
  }
  host::log_line("%s can't be renamed to %s (%s); see what stands there", folder.c_str(),
                 to.c_str(), std::strerror(errno));
  return false;
}

bool make_folder_like(const std::string& folder, const std::string& to) {
  const host::Fd opened = host::open_report_folder(folder);
  struct stat like {};
  if (!opened) {
    return false;
  }
  if (fstat(opened.get(), &like) == 0 && mkdir(to.c_str(), like.st_mode & 0777U) == 0) {
    return true;
  }
  host::log_line("%s can't be made (%s); see what stands there", to.c_str(), std::strerror(errno));
  return false;
}

std::optional<std::string> link_to(const Section& profile, const std::string& page) {
  const VLIBCSzHash hash = hash_of(profile);
  std::array<char, 8192> link{};
  return VornGetTargetLink(&hash, page.c_str(), link.data(), link.size()) == 0
             ? std::optional<std::string>(link.data())
             : std::nullopt;
}

std::string report_dir_problem(const std::string& value) {
  const char* error = host::report_dir_error(value);
  if (error != nullptr) {
    return error;
  }
  const std::string problem = host::report_dir_problem(value);
  return problem.empty() ? "" : "can't be used: " + problem;
}

std::string link_base_problem(const std::string& value) {
  return text_or_empty(host::link_base_error(value));
}

std::string keep_reports_problem(const std::string& value) {
  const auto sink = host::redirect_log([](const char*) {});  // said here in fewer words
  const std::size_t count = host::reports_to_keep("", hash_of({"", {{"keep_reports", value}}}));
  host::redirect_log(sink);
  return count > 0 ? "" : "is no number from 1 on";
}

}  // namespace admin
