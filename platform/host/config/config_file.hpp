// What the host needs of configuration files besides the API.
#ifndef VORN_HOST_CONFIG_FILE_HPP
#define VORN_HOST_CONFIG_FILE_HPP

#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace host {

// The text of `file`; nothing, after one log line, when it can't be read.
std::optional<std::string> read_config(const char* file);
// Whether `file` can be read; one log line when it can't.
bool config_is_readable(const char* file);

// Removes what killed writers of `file` have left beside it, unless one is at work.
void remove_unfinished_rewrites(const char* file);

// Puts in the place of `file` what `change` makes of its text: atomically, with the same owner and
// mode, under a lock against a second writer, for which it waits at most ten seconds. A link to the
// file stays. 0; -1 on failure with nothing changed, one log line, and VLIBCErrGet set. `change`
// returns nothing to leave the file as it is, after having done the latter two itself.
using TextChange = std::function<std::optional<std::string>(std::string_view text)>;
int rewrite_config(const char* file, const TextChange& change);

}  // namespace host

#endif
