// What the host needs of configuration files besides the API.
#ifndef VORN_HOST_CONFIG_FILE_HPP
#define VORN_HOST_CONFIG_FILE_HPP

#include <chrono>
#include <optional>
#include <string>
#include <string_view>

#include "vorn/config.h"

namespace host {

// The text of `file`; nothing, after one log line, when it can't be read.
std::optional<std::string> read_config(const char* file);
// Whether `file` can be read; one log line when it can't.
bool config_is_readable(const char* file);

// VLIBCFileSetSection, waiting at most `lock_wait` for another writer.
int set_section(const char* file, std::string_view section, const VLIBCSzHash& hash,
                std::string_view format, std::chrono::milliseconds lock_wait);

}  // namespace host

#endif
