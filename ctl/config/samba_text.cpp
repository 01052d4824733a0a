#include "config/samba_text.hpp"

#include <algorithm>

#include "vorn/base/words.hpp"

namespace ctl {
namespace {

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

}  // namespace

std::string lower(std::string_view text) {
  std::string out(text);
  std::transform(out.begin(), out.end(), out.begin(),
                 [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c | 0x20) : c; });
  return out;
}

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

Service user_share_in(std::string_view text, const std::string& file) {
  Service share = parse_services("[share]\n" + std::string(text)).front();
  const auto name = share.parameters.find("sharename");
  share.name = name != share.parameters.end() ? name->second : file;
  return share;
}

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

}  // namespace ctl
