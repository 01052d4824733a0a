#include "fuzz.hpp"

#include <cstdint>

// Inputs are wrong on purpose: their log lines would fill the machine's log.
extern "C" {
void syslog(int /*priority*/, const char* /*format*/, ...) {}
void __syslog_chk(int /*priority*/, int /*flag*/, const char* /*format*/, ...) {}
int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);
}

int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const bool quiet = std::freopen("/dev/null", "w", stdout) != nullptr;
  fuzz::require(quiet, "/dev/null opens");
  fuzz::one(size == 0 ? std::string_view()
                      : std::string_view(reinterpret_cast<const char*>(data), size));
  return 0;
}
