// Texts of several words or lines.
#ifndef VORN_HOST_WORDS_HPP
#define VORN_HOST_WORDS_HPP

#include <algorithm>
#include <string_view>
#include <vector>

namespace host {

// `text` without the blanks around it.
inline std::string_view trimmed(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\n\v\f\r";
  const std::size_t first = std::min(text.find_first_not_of(kBlanks), text.size());
  text.remove_prefix(first);
  return text.substr(0, text.find_last_not_of(kBlanks) + 1);
}

// The words of a comma-separated list, without the blanks around them; empty ones don't count.
inline std::vector<std::string_view> comma_words(std::string_view list) {
  std::vector<std::string_view> words;
  while (!list.empty()) {
    const std::size_t end = std::min(list.find(','), list.size());
    if (const std::string_view word = trimmed(list.substr(0, end)); !word.empty()) {
      words.push_back(word);
    }
    list.remove_prefix(std::min(end + 1, list.size()));
  }
  return words;
}

// Calls `visit` with each line of `text`, without its end.
template <typename Visit>
void each_line(std::string_view text, Visit visit) {
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t end = std::min(text.find('\n', start), text.size());
    visit(text.substr(start, end - start));
    start = end + 1;
  }
}

}  // namespace host

#endif
