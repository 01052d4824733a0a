#include "driver.hpp"

#include <getopt.h>

#include <csignal>

#include "actions.hpp"
#include "facts/run_facts.hpp"
#include "out_of_memory.hpp"
#include "sigterm.hpp"
#include "temp_files.hpp"
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
      clean_action(argv);
      break;
    default:
      break;
  }
  clean_temp_files(0);
  return 0;
}

}  // namespace vornreport
