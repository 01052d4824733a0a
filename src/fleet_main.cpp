// vornfleet FOLDER REPORTS LANGUAGE SERVERS: makes a report over the fleet, for vornctl. Its last
// line is the path of the page.
#include <cstdio>

#include "vornreport/fleet_action.hpp"

int main(int argc, char** argv) {
  constexpr int kArguments = 5;
  if (argc != kArguments) {
    std::fputs("vornfleet: run vornctl fleet report\n", stderr);
    return 2;
  }
  const std::string page = vornreport::fleet_report({argv[1], argv[2], argv[3], argv[4]});
  if (page.empty()) {
    return 1;
  }
  std::printf("%s\n", page.c_str());
  return std::fflush(stdout) == 0 ? 0 : 1;
}
