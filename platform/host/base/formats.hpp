// Texts for the page, as strings; the C API copies them into the caller's buffers.
#ifndef VORN_HOST_FORMATS_HPP
#define VORN_HOST_FORMATS_HPP

#include <string>
#include <string_view>

#include "base/text_containers.hpp"

namespace host {

// As VornQazEscChar.
std::string escape_js(std::string_view text, char quote);

// As VornQazFormatCsvString.
std::string csv_field(std::string_view text);

// The script block of VornQazImportSharePathHash. Its keys are computed ones, so that a share
// named __proto__ is an entry like any other.
std::string share_path_block(const VLIBCSzHash& share_paths);

}  // namespace host

#endif
