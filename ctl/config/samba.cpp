#include "config/samba.hpp"

#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <optional>

#include "base/ask_program.hpp"
#include "base/ctl.hpp"
#include "config/samba_text.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"

namespace ctl {
namespace {

std::string last_line(std::string_view text) {
  text = host::trimmed(text);
  return std::string(text.substr(text.rfind('\n') + 1));
}

std::vector<Service> configured_services() {
  const std::optional<Answer> answer = ask_program({"testparm", "-s", "--suppress-prompt"});
  if (!answer) {
    throw Failure("testparm is missing; install the package samba-common-bin");
  }
  if (answer->status != 0) {
    throw Failure("testparm can't read Samba's configuration: " + last_line(answer->error));
  }
  return parse_services(answer->out);
}

// As `net` tells it, from the files that it reads.
std::vector<Service> services_in(const std::string& folder) {
  constexpr std::size_t kLargestFile = 65536;
  std::vector<Service> services;
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(folder, error)) {
    struct stat file {};
    struct stat target {};
    const std::string path = entry.path().string();
    const std::optional<std::string> text = host::read_file(path, kLargestFile);
    if (!text || lstat(path.c_str(), &file) != 0 || !S_ISREG(file.st_mode)) {
      continue;
    }
    Service service = user_share_in(*text, entry.path().filename().string());
    const std::string& shared = service.parameters["path"];
    if (file.st_uid != 0 && (stat(shared.c_str(), &target) != 0 || target.st_uid != file.st_uid)) {
      continue;  // Samba offers only folders that belong to who has shared them
    }
    services.push_back(std::move(service));
  }
  std::sort(services.begin(), services.end(),
            [](const Service& a, const Service& b) { return a.name < b.name; });
  return services;
}

std::vector<Service> user_services(const Parameters& global) {
  const auto configured = global.find("usersharepath");
  const std::string folder =
      configured == global.end() ? "/var/lib/samba/usershares" : configured->second;
  std::error_code error;
  if (!std::filesystem::is_directory(folder, error)) {
    return {};
  }
  const std::optional<Answer> answer = ask_program({"net", "usershare", "info", "--long"});
  if (!answer) {
    return services_in(folder);
  }
  if (answer->status != 0) {
    warn("the shares of users are left out: " + last_line(answer->error));
    return {};
  }
  return parse_services(answer->out);
}

}  // namespace

std::vector<SambaShare> samba_shares() {
  std::vector<Service> services = configured_services();
  Parameters global;
  const auto is_global = [](const Service& service) { return lower(service.name) == "global"; };
  for (const Service& service : services) {
    if (is_global(service)) {
      global = service.parameters;
    }
  }
  std::erase_if(services, is_global);
  // A user's share is known by where it comes from: testparm doesn't read them, and nothing in
  // their text counts.
  for (Service& service : user_services(global)) {
    service.of_user = true;
    services.push_back(std::move(service));
  }
  std::vector<SambaShare> shares(services.size());
  std::transform(services.begin(), services.end(), shares.begin(),
                 [&](const Service& service) { return judged(service, global); });
  return shares;
}

}  // namespace ctl
