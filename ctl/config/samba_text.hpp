// What Samba's programs print, and what users write into the files of their shares.
#ifndef VORN_CTL_SAMBA_TEXT_HPP
#define VORN_CTL_SAMBA_TEXT_HPP

#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "config/samba.hpp"

namespace ctl {

// Parameters by their plain names.
using Parameters = std::map<std::string, std::string, std::less<>>;

struct Service {
  std::string name;
  Parameters parameters{};
  bool of_user = false;
};

// With ASCII letters in lower case.
std::string lower(std::string_view text);

// The sections of what testparm and net print: no continued lines, no quotes around names.
std::vector<Service> parse_services(std::string_view text);

// The share in `text`, the content of a user's file `file`, whatever else stands in it.
Service user_share_in(std::string_view text, const std::string& file);

// `defaults` are the parameters of [global], which hold for every share that has no own.
SambaShare judged(const Service& service, const Parameters& defaults);

}  // namespace ctl

#endif
