// Language codes.
#ifndef VORN_HOST_LANGUAGE_HPP
#define VORN_HOST_LANGUAGE_HPP

#include "report_format/values.hpp"

namespace host {

using report_format::is_language_code;

}  // namespace host

#endif
