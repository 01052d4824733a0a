// Texts for the page, as strings; the C API copies them into the caller's buffers.
#ifndef VORN_HOST_FORMATS_HPP
#define VORN_HOST_FORMATS_HPP

#include <string>
#include <string_view>

namespace host {

// As VornQazEscChar.
std::string escape_js(std::string_view text, char quote);

// As VornQazFormatCsvString.
std::string csv_field(std::string_view text);

}  // namespace host

#endif
