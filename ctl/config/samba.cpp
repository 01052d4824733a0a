#include "config/samba.hpp"

#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <optional>

#include "base/ask_program.hpp"
#include "base/ctl.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"

namespace ctl {
namespace {

// Parameters by their plain names.
using Parameters = std::map<std::string, std::string, std::less<>>;

struct Service {
  std::string name;
  Parameters parameters{};
  bool of_user = false;
};

std::string lower(std::string_view text) {
  std::string out(text);
  std::transform(out.begin(), out.end(), out.begin(),
                 [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c | 0x20) : c; });
  return out;
}

// Names of parameters don't depend on case and blanks, and some have a second name.
std::string plain_name(std::string_view name) {
  std::string plain = lower(name);
  std::erase_if(plain, [](char c) { return c == ' ' || c == '\t'; });
  return plain == "directory" ? "path" : plain == "printok" ? "printable" : plain;
}

bool is_true(std::string_view value) {
  const std::string word = lower(value);
  return word == "yes" || word == "true" || word == "on" || word == "1";
}

// The sections of what testparm and net print: no continued lines, no quotes around names.
std::vector<Service> parse_services(std::string_view text) {
  std::vector<Service> services;
  while (!text.empty()) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = host::trimmed(text.substr(0, end));
    text.remove_prefix(std::min(end + 1, text.size()));
    const std::size_t equals = line.find('=');
    if (line.size() >= 2 && line.front() == '[' && line.back() == ']') {
      services.push_back({.name = std::string(line.substr(1, line.size() - 2))});
    } else if (!services.empty() && equals != std::string_view::npos && line.front() != '#') {
      std::string_view value = host::trimmed(line.substr(equals + 1));
      if (value.size() >= 2 && value.front() == '"' && value.back() == '"') {
        value = value.substr(1, value.size() - 2);
      }
      services.back().parameters.insert_or_assign(plain_name(host::trimmed(line.substr(0, equals))),
                                                  std::string(value));
    }
  }
  return services;
}

// `defaults` are the parameters of [global], which hold for every share that has no own.
SambaShare judged(const Service& service, const Parameters& defaults) {
  const auto value = [&](const char* name) -> std::string {
    for (const Parameters* parameters : {&service.parameters, &defaults}) {
      if (const auto found = parameters->find(name); found != parameters->end()) {
        return found->second;
      }
    }
    return "";
  };
  SambaShare share{service.name, value("path"), "", service.of_user};
  const std::string name = lower(share.name);
  if (name == "homes") {
    share.skipped = "it stands for the home folders of all users";
  } else if (name == "printers" || name == "print$" || is_true(value("printable"))) {
    share.skipped = "it is for printers";
  } else if (!value("available").empty() && !is_true(value("available"))) {
    share.skipped = "it is not available";
  } else if (!value("-valid").empty() && !is_true(value("-valid"))) {
    share.skipped = "it is a template for other shares";
  } else if (!value("msdfsproxy").empty()) {
    share.skipped = "its files are on another server";
  } else if (share.path.find('%') != std::string::npos) {
    share.skipped = "its path " + share.path + " is another one for each user or client";
  }
  return share;
}

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
    std::vector<Service> found = parse_services("[share]\n" + *text);
    Service& service = found.front();
    const auto name = service.parameters.find("sharename");
    service.name =
        name != service.parameters.end() ? name->second : entry.path().filename().string();
    const std::string shared = service.parameters["path"];
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
