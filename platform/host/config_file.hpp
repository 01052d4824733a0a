// Rewriting a configuration section with a chosen patience.
#ifndef VORN_HOST_CONFIG_FILE_HPP
#define VORN_HOST_CONFIG_FILE_HPP

#include <chrono>
#include <string_view>

#include "vorn/config.h"

namespace host {

// VLIBCFileSetSection, waiting at most `lock_wait` for another writer.
int set_section(const char* file, std::string_view section, const VLIBCSzHash& hash,
                std::string_view format, std::chrono::milliseconds lock_wait);

}  // namespace host

#endif
