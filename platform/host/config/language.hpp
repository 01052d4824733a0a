// Language codes.
#ifndef VORN_HOST_LANGUAGE_HPP
#define VORN_HOST_LANGUAGE_HPP

#include <string_view>

namespace host {

// Whether `code` is letters, digits and '-', not beginning with one: fit for a word of a shell
// command and for the name of a file.
bool is_language_code(std::string_view code);

}  // namespace host

#endif
