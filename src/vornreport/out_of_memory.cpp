#include "out_of_memory.hpp"

#include <unistd.h>

#include <cstdio>
#include <memory>
#include <new>

#include "module.hpp"
#include "shell.hpp"
#include "temp_files.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

constexpr size_t kReserve = size_t{512} * 1024;

const char* g_profile = nullptr;
const VLIBCSzHash* g_profile_hash = nullptr;
std::unique_ptr<char[]> g_reserve;

[[noreturn]] void end_run() {
  std::set_new_handler(nullptr);  // what is written below may throw, but not come here again
  release_memory_reserve();       // what is written below needs some
  try {
    REPORT_LOG_ERR(kDriverModule, __LINE__, "out of memory, the run ends\n");
    end_running_command();
    if (g_profile != nullptr) {
      VornQazReportCleanTmp(g_profile, g_profile_hash);
      VornQazStatusUpdate(g_profile, "fail");
    }
    clean_temp_files(0);
    std::fflush(nullptr);
  } catch (...) {
    // The status stays "collect_data", which says that the run was cut short.
  }
  _exit(0);  // as every run that fails
}

// What has no room for the reserve has none for a line in the log either, nor for an exception.
[[noreturn]] void end_unbegun() {
  constexpr char kLine[] = "out of memory before the run began; raise its limit of memory\n";
  static_cast<void>(!write(STDERR_FILENO, kLine, sizeof kLine - 1));
  _exit(1);
}

}  // namespace

void end_without_memory(const char* profile, const VLIBCSzHash* profile_hash) {
  g_profile = profile;
  g_profile_hash = profile_hash;
  if (!g_reserve) {
    std::set_new_handler(end_unbegun);
    g_reserve = std::make_unique<char[]>(kReserve);
  }
  std::set_new_handler(end_run);
}

void release_memory_reserve() {
  g_reserve.reset();
}

}  // namespace vornreport
