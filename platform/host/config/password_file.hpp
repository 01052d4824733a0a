// The file that holds a password which a configuration only names.
#ifndef VORN_HOST_PASSWORD_FILE_HPP
#define VORN_HOST_PASSWORD_FILE_HPP

#include <string>

namespace host {

// Takes the first line of the file `path` into `password`. What keeps it from being used ("can be
// read or changed by others; ..."), or empty.
std::string password_problem(const std::string& path, std::string& password);

}  // namespace host

#endif
