// Names of accounts, as the reports can show them.
#ifndef VORN_HOST_USERS_HPP
#define VORN_HOST_USERS_HPP

#include <string_view>

namespace host {

// What keeps `name` from being handed out (see vorn/user.h), as the end of a sentence that begins
// with "its name"; null when nothing does.
const char* account_name_error(std::string_view name);

}  // namespace host

#endif
