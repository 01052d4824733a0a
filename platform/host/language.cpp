// The language of the page.
#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string_view>

#include "host_log.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace {

// The code becomes a word of a shell command.
constexpr bool is_code_char(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-';
}

}  // namespace

int VornQazImportLang(const VLIBCSzHash* hash, char* code, size_t size) {
  constexpr std::string_view kDefault = "en";
  if (hash == nullptr || code == nullptr || size <= kDefault.size()) {
    errno = EINVAL;
    return -1;
  }
  const char* value = VLIBCSzHashGetValue(hash, "language");
  std::string_view language = value == nullptr || *value == '\0' ? kDefault : value;
  const bool begins_well = language.front() != '-';  // or it would read as an option
  if (!begins_well || language.size() >= size ||
      !std::all_of(language.begin(), language.end(), is_code_char)) {
    host::log_line(
        "language \"%.80s\" is no code of at most %zu letters, digits and '-', so the page is in "
        "English; write language = en, for example, in %s",
        value, size - 1, VORN_PATH_CONFIG);
    language = kDefault;
  }
  std::memcpy(code, language.data(), language.size());
  code[language.size()] = '\0';
  return 0;
}
