#include "fleet/fleet_conf.hpp"

#include <curl/curl.h>
#include <sys/stat.h>
#include <zlib.h>

#include <algorithm>
#include <cerrno>
#include <memory>

#include "base/text_containers.hpp"
#include "config/password_file.hpp"
#include "config/shares.hpp"
#include "report_format/fleet.hpp"
#include "report_format/values.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"
#include "vorn/config.h"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace host {
namespace {

constexpr std::size_t kLongestName = 64;

struct UrlCleanup {
  void operator()(CURLU* url) const { curl_url_cleanup(url); }
};

std::string url_part(CURLU* url, CURLUPart part) {
  char* text = nullptr;
  const bool found = curl_url_get(url, part, &text, 0) == CURLUE_OK;
  const std::unique_ptr<char, decltype(&curl_free)> owned(text, &curl_free);
  return found ? text : "";
}

// Null when `text` leads to a node.
const char* url_error(const std::string& text) {
  const std::unique_ptr<CURLU, UrlCleanup> url(curl_url());
  if (!url || curl_url_set(url.get(), CURLUPART_URL, text.c_str(), 0) != CURLUE_OK) {
    return "is no address; write http://host:8123/ or https://host:8443/";
  }
  const std::string scheme = url_part(url.get(), CURLUPART_SCHEME);
  if (scheme != "http" && scheme != "https") {
    return "is neither http:// nor https://";
  }
  for (const CURLUPart part : {CURLUPART_USER, CURLUPART_PASSWORD, CURLUPART_OPTIONS}) {
    if (!url_part(url.get(), part).empty()) {
      return "holds credentials; write them as user and password_file";
    }
  }
  if (!url_part(url.get(), CURLUPART_QUERY).empty() ||
      !url_part(url.get(), CURLUPART_FRAGMENT).empty()) {
    return "holds '?' or '#'; end it behind host and port";
  }
  return nullptr;
}

bool is_identifier(std::string_view name, std::string_view others) {
  return !name.empty() && name.size() <= kLongestName &&
         std::all_of(name.begin(), name.end(), [&](char c) {
           return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                  others.find(c) != std::string_view::npos;
         });
}

std::string host_name() {
  char name[256] = "";
  return VornQazGetHostName(name, sizeof name) > 0 ? name : "localhost";
}

std::string in_file(const std::string& what) {
  return std::string(VORN_PATH_FLEET ": ") + what;
}

// Takes the values over; the first thing that is wrong with them, or nothing.
std::string take(const std::vector<std::pair<std::string, std::string>>& entries, FleetConf& conf) {
  std::string password_file;
  conf.database = "vornreport";
  conf.server = host_name();
  for (const auto& [key, value] : entries) {
    if (key == "url") {
      for (const std::string_view url : comma_words(value)) {
        conf.urls.emplace_back(url);
      }
    } else if (key == "insecure") {
      conf.insecure = report_format::is_true(value);
    } else if (key == "password_file") {
      password_file = value;
    } else if (key == "database" || key == "cluster" || key == "user" || key == "server") {
      if (!value.empty()) {
        (key == "database"  ? conf.database
         : key == "cluster" ? conf.cluster
         : key == "user"    ? conf.user
                            : conf.server) = value;
      }
    } else {
      return "key " + key + " is unknown; see fleet.conf(5)";
    }
  }
  if (conf.urls.empty()) {
    return "url is missing; write url = http://host:8123/";
  }
  for (const std::string& url : conf.urls) {
    if (const char* error = url_error(url); error != nullptr) {
      // An address with credentials isn't repeated to a log that others read.
      const bool is_secret = url.find('@') != std::string::npos;
      return "url " + (is_secret ? std::string() : url + " ") + error;
    }
  }
  if (!is_identifier(conf.database, "_")) {
    return "database \"" + conf.database + "\" is no name of letters, digits and _";
  }
  if (!conf.cluster.empty() && !is_identifier(conf.cluster, "_.-")) {
    return "cluster \"" + conf.cluster + "\" is no name of letters, digits, '_', '.' and '-'";
  }
  if (const char* error = server_name_error(conf.server); error != nullptr) {
    return "server \"" + conf.server + "\" can't be a name: " + error;
  }
  if (conf.user.find(':') != std::string::npos) {
    return "user \"" + conf.user + "\" holds a colon";
  }
  if (password_file.empty()) {
    return "";
  }
  if (conf.user.empty()) {
    return "password_file is set, but no user";
  }
  const std::string error = password_problem(password_file, conf.password);
  return error.empty() ? "" : "password_file " + password_file + " " + error;
}

}  // namespace

FleetReading fleet_conf_of(const std::vector<std::pair<std::string, std::string>>& entries) {
  FleetConf conf;
  std::string problem = take(entries, conf);
  if (!problem.empty()) {
    return {std::nullopt, in_file(problem)};
  }
  return {std::move(conf), ""};
}

std::string FleetConf::part_of(std::string_view table) const {
  return std::string(table) + (cluster.empty() ? "" : std::string(report_format::kFleetPart));
}

std::size_t FleetConf::home() const {
  const auto* bytes = reinterpret_cast<const Bytef*>(server.data());
  return cluster.empty() ? 0 : crc32_z(0, bytes, server.size()) % urls.size();
}

FleetReading read_fleet_conf() {
  const ErrnoKeeper keeper;
  struct stat status {};
  if (stat(VORN_PATH_FLEET, &status) != 0 && errno == ENOENT) {
    return {};
  }
  VLIBCSzHash section(0);
  VLIBCSzHash* hash = &section;
  if (VLIBCFileGetSection(VORN_PATH_FLEET, kFleetSection, &hash) < 0) {
    if (VLIBCErrGet() == VLIBC_ERR_NO_SECTION) {
      return {};
    }
    return {std::nullopt, in_file("section [fleet] can't be read; run vornctl fleet set")};
  }
  std::vector<std::pair<std::string, std::string>> entries;
  for (const auto& [key, value] : section.sorted()) {
    entries.emplace_back(key, value);
  }
  // A file that was shipped, or emptied, names no engine.
  return entries.empty() ? FleetReading{} : fleet_conf_of(entries);
}

const char* server_name_error(std::string_view name) {
  if (name.empty()) {
    return "it is empty";
  }
  if (name.find(':') != std::string_view::npos) {
    return "it holds a colon, which stands between a server and its share";
  }
  return share_name_error(std::string(name) + ":");  // as what a share's name begins with
}

}  // namespace host
