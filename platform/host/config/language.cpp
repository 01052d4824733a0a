// The language of the page.
#include "config/language.hpp"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string_view>

#include "base/host_log.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace host {

bool is_language_code(std::string_view code) {
  return !code.empty() && code.front() != '-' && std::all_of(code.begin(), code.end(), [](char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-';
  });
}

}  // namespace host

int VornQazImportLang(const VLIBCSzHash* hash, char* code, size_t size) {
  constexpr std::string_view kDefault = "en";
  if (hash == nullptr || code == nullptr || size <= kDefault.size()) {
    errno = EINVAL;
    return -1;
  }
  const char* value = VLIBCSzHashGetValue(hash, "language");
  std::string_view language = value == nullptr || *value == '\0' ? kDefault : value;
  if (!host::is_language_code(language) || language.size() >= size) {
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
