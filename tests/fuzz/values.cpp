// Small values of a profile that reach a command, a path, a mail or a page.
#include "report_format/values.hpp"

#include <array>

#include "fuzz.hpp"
#include "run/link.hpp"
#include "run/run_paths.hpp"
#include "vorn/base/words.hpp"
#include "vorn/text.h"

namespace {

bool has_any(std::string_view text, std::string_view bytes) {
  return text.find_first_of(bytes) != std::string_view::npos;
}

constexpr std::string_view kLineEnds{"\0\r\n\x7f\x1b", 5};

// The word that a shell reads.
std::string unquoted(std::string_view command) {
  std::string word;
  bool inside = false;
  for (std::size_t i = 0; i < command.size(); ++i) {
    if (command[i] == '\'') {
      inside = !inside;
    } else if (inside) {
      word += command[i];
    } else {
      fuzz::require(command.substr(i, 2) == "\\'", "nothing stands outside of quotes");
      word += command[++i];
    }
  }
  fuzz::require(!inside, "quotes are closed");
  return word;
}

}  // namespace

void fuzz::one(std::string_view value) {
  if (report_format::is_language_code(value)) {
    require(value.size() <= report_format::kLongestLanguage && !has_any(value, "./ '\";$`\\<") &&
                !has_any(value, kLineEnds),
            "a language is a word");
  }
  if (host::link_base_error(value) == nullptr) {
    require(!has_any(value, " \"'<>?#") && !has_any(value, kLineEnds), "a link ends nowhere");
  }
  if (host::report_dir_error(value) == nullptr) {
    require(value.starts_with('/') && !has_any(value, "'") && !has_any(value, kLineEnds) &&
                !value.ends_with("/..") && value.find("/../") == value.npos,
            "a folder stands between single quotes");
  }
  for (const std::string_view word : host::comma_words(value)) {
    require(!word.empty() && word == host::trimmed(word) && !has_any(word, ","), "words are bare");
  }
  static std::array<char, 16384> quoted;
  const std::string text(value.substr(0, value.find('\0')));
  if (VLIBCEncShParam(text.c_str(), quoted.data(), quoted.size()) >= 0) {
    require(unquoted(quoted.data()) == text, "a shell reads the same word");
  }
}
