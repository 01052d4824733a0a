#include "driver.hpp"

#include <getopt.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>

#include "actions.hpp"
#include "facts/run_facts.hpp"
#include "out_of_memory.hpp"
#include "sigterm.hpp"
#include "temp_files.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

int32_t gACT = 0;

namespace vornreport {
namespace {

enum Action : int32_t { kReport = 1, kData = 2, kClean = 3 };

const option kOptions[] = {
    {"report", no_argument, &gACT, kReport},
    {"data", no_argument, &gACT, kData},
    {"clean", no_argument, &gACT, kClean},
    {nullptr, 0, nullptr, 0},
};

// People clean by hand, where nobody reads the log; and to who may not even read the configuration
// there would be no profiles.
void tell_missing_rights() {
  if (access(VORN_PATH_STAT, W_OK) != 0 && errno != ENOENT) {
    std::fprintf(stderr, "vornreport: %s can't be written (%s), so nothing is cleaned; %s\n",
                 VORN_PATH_STAT, std::strerror(errno),
                 errno == EROFS ? "mount it for writing" : "run this as root");
  }
}

}  // namespace

int run(int argc, char** argv) {
  // Once: only the first option counts, the rest stays among the arguments.
  getopt_long_only(argc, argv, "", kOptions, nullptr);
  argv += optind;
  end_without_memory(nullptr, nullptr);
  VornQazSetEnv();
  listen_for_incidents();
  switch (gACT) {
    case kReport:
      setup_signal(SIGTERM);
      collect_action(nullptr);
      report_action(argv);
      break;
    case kData:
      setup_signal(SIGTERM);
      // A sample that couldn't be stored is an incident, and here there is no report to tell it.
      if (collect_action(argv) < 0 || !run_facts().incidents.empty()) {
        VornQazDataFailed(*argv);
      }
      break;
    case kClean:
      tell_missing_rights();
      clean_action(argv);
      break;
    default:
      break;
  }
  clean_temp_files(0);
  return 0;
}

}  // namespace vornreport
