// What the host needs of configuration files besides the API.
#ifndef VORN_HOST_CONFIG_FILE_HPP
#define VORN_HOST_CONFIG_FILE_HPP

#include <chrono>
#include <string_view>

#include "vorn/config.h"

namespace host {

// Whether `file` can be read; one log line when it can't.
bool config_is_readable(const char* file);

// VLIBCFileSetSection, waiting at most `lock_wait` for another writer.
int set_section(const char* file, std::string_view section, const VLIBCSzHash& hash,
                std::string_view format, std::chrono::milliseconds lock_wait);

}  // namespace host

#endif
