// Looks at facts in JSON without reading them as a whole.
#pragma once

#include <cstddef>
#include <string_view>

namespace report_format {

// Far more than any object of ours has.
inline constexpr std::size_t kMostKeys = 256;

// Whether an object in `text` has more than kMostKeys keys. Objects that keep the order of their
// keys look through all of them for each, which takes quadratic time.
bool has_object_of_many_keys(std::string_view text);

}  // namespace report_format
