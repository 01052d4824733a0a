// The link under which readers find a finished report.
#ifndef VORN_HOST_LINK_HPP
#define VORN_HOST_LINK_HPP

#include <string_view>

namespace host {

// What is wrong with a link_base, or null. It stands in a mail and before a path, so it is a plain
// URL: no query, no fragment, nothing that a mail program would end it at.
const char* link_base_error(std::string_view base);

}  // namespace host

#endif
