// The language of the page.
#include <cerrno>
#include <cstring>
#include <string_view>

#include "base/host_log.hpp"
#include "report_format/values.hpp"
#include "vorn/report.h"

int VornQazImportLang(const VLIBCSzHash* hash, char* code, size_t size) {
  constexpr std::string_view kDefault = "en";
  if (hash == nullptr || code == nullptr || size <= kDefault.size()) {
    errno = EINVAL;
    return -1;
  }
  const char* value = VLIBCSzHashGetValue(hash, "language");
  std::string_view language = value == nullptr || *value == '\0' ? kDefault : value;
  if (!report_format::is_language_code(language) || language.size() >= size) {
    host::log_line(
        "language \"%.80s\" is no code of at most %zu letters, digits and '-', so the page is in "
        "English; run vornctl profile set PROFILE language CODE",
        value, size - 1);
    language = kDefault;
  }
  std::memcpy(code, language.data(), language.size());
  code[language.size()] = '\0';
  return 0;
}
