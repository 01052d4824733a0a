// The link under which readers find a finished report.
#include "run/link.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>

#include "base/host_log.hpp"
#include "base/text_containers.hpp"
#include "report_format/reports.hpp"
#include "run/page.hpp"
#include "run/run_paths.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace {

// Everything but RFC 3986's unreserved characters, and the slashes that keep the path a path.
std::string percent_encoded(std::string_view path) {
  constexpr std::string_view kPlain =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-._~/";
  constexpr std::string_view kHex = "0123456789ABCDEF";
  std::string out;
  for (const char c : path) {
    if (kPlain.find(c) != std::string_view::npos) {
      out += c;
    } else {
      const auto byte = static_cast<unsigned char>(c);
      out += {'%', kHex[byte >> 4U], kHex[byte & 15U]};
    }
  }
  return out;
}

// The URL that stands for the report folder, without a slash at its end; empty when refused.
std::string base_of(const VLIBCSzHash& hash, const std::string& report_dir) {
  const char* configured = hash.find("link_base");
  std::string base = configured == nullptr || *configured == '\0'
                         ? "file://" + percent_encoded(report_dir)
                         : configured;
  if (const char* problem = host::link_base_error(base); problem != nullptr) {
    host::log_line(
        "link_base \"%.1100s\" %s; run vornctl profile set PROFILE link_base "
        "https://SERVER/REPORTS",
        base.c_str(), problem);
    return {};
  }
  while (base.back() == '/') {
    base.pop_back();
  }
  return base;
}

// `file` as seen from `folder`; nothing when it lies elsewhere.
std::optional<std::string> below(const std::string& folder, const char* file) {
  const std::filesystem::path relative =
      std::filesystem::path(file).lexically_normal().lexically_relative(
          std::filesystem::path(folder + "/").lexically_normal());
  if (relative.empty() || *relative.begin() == "..") {
    return std::nullopt;
  }
  return relative.string();
}

void open_to_group(const std::string& path, gid_t group) {
  constexpr mode_t kMode = 0640;
  const host::Fd file = host::open_regular(AT_FDCWD, path.c_str());
  if (file &&
      (fchown(file.get(), static_cast<uid_t>(-1), group) != 0 || fchmod(file.get(), kMode) != 0)) {
    host::log_line("report \"%s\" can't be opened to its group (%s)", path.c_str(),
                   std::strerror(errno));
  }
}

// The page was made for its owner alone, in /tmp. Whoever may enter its folder (a web server, say,
// by a setgid report_dir) may read it from now on, as the CSV files and the facts beside it.
void open_report_to_group(const std::string& page) {
  const host::ErrnoKeeper keeper;
  const std::string folder = page.substr(0, page.rfind('/'));
  struct stat status {};
  if (stat(folder.c_str(), &status) == 0) {
    open_to_group(page, status.st_gid);
    open_to_group(folder + "/" + report_format::kFactsFile, status.st_gid);
  }
}

int make_link(const VLIBCSzHash& hash, const char* target_file, char* link, size_t size) {
  // Of the run that is being made every part is looked at; older ones were found whole.
  const std::optional<host::ReportRun>& run = host::report_run();
  const bool is_complete = run && run->page == target_file
                               ? host::page_is_whole(target_file, run->report_list)
                               : host::page_is_complete(target_file);
  if (!is_complete) {
    host::log_line("no link to \"%s\": it is no complete report page; see the errors of this run",
                   target_file);
    errno = ENOENT;
    return -1;
  }
  open_report_to_group(target_file);
  const char* configured = hash.find("report_dir");
  const std::string report_dir =
      configured == nullptr || *configured == '\0' ? VORN_PATH_REPORTS : configured;
  const std::optional<std::string> rest = below(report_dir, target_file);
  errno = EINVAL;
  if (!rest) {
    host::log_line(R"(no link to "%s": it isn't below report_dir "%s")", target_file,
                   report_dir.c_str());
    return -1;
  }
  const std::string base = base_of(hash, report_dir);
  if (base.empty()) {
    return -1;
  }
  const std::string text = base + "/" + percent_encoded(*rest);
  if (text.size() >= size) {
    host::log_line(
        "the link to \"%s\" is longer than %zu bytes; give the profile a shorter link_base with "
        "vornctl profile set",
        target_file, size - 1);
    errno = ENAMETOOLONG;
    return -1;
  }
  std::memcpy(link, text.c_str(), text.size() + 1);
  return 0;
}

}  // namespace

const char* host::link_base_error(std::string_view base) {
  const bool is_file = base.starts_with("file:///");
  if (!is_file && !base.starts_with("http://") && !base.starts_with("https://")) {
    return "doesn't begin with http://, https:// or file:///";
  }
  const auto is_bad = [](unsigned char c) {
    return c <= ' ' || c >= 0x7F || std::strchr("\"'<>\\^`{|}?#", c) != nullptr;
  };
  if (std::any_of(base.begin(), base.end(), is_bad)) {
    return "holds a blank, quote, query or other character that must be percent-encoded";
  }
  const std::string_view authority = base.substr(base.find("//") + 2);
  return !is_file && (authority.empty() || authority.front() == '/') ? "names no host" : nullptr;
}

int VornGetTargetLink(const VLIBCSzHash* hash, const char* target_file, char* link,
                      size_t size) try {
  if (hash == nullptr || target_file == nullptr || link == nullptr || size == 0) {
    errno = EINVAL;
    return -1;
  }
  *link = '\0';
  return host::keeping_errno([&] { return make_link(*hash, target_file, link, size); });
} catch (...) {
  errno = ENOMEM;
  return -1;
}
