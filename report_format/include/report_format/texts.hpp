// The mail's texts in the language of a profile, from the dictionaries of the report page.
#pragma once

#include <initializer_list>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace report_format {

// Where a text goes. Texts that come from elsewhere pass through name_in() for it.
enum class TextForm { plain, html };

// `name`, which may be any bytes, as a reader can't be misled by it: control and format characters
// (those that turn the direction of text among them) come out as U+202E, bytes that are no UTF-8 as
// \xff. In HTML it is escaped and keeps its direction to itself.
std::string name_in(TextForm form, std::string_view name);
// `text` with nothing left in it that HTML would take for its own.
std::string escape_html(std::string_view text);

class Texts {
 public:
  using Values = std::initializer_list<std::pair<std::string_view, std::string>>;

  // The dictionaries of `folder` for the language `code`: de-AT, else de; behind them English. One
  // that is missing or no JSON counts as empty.
  Texts(const std::string& folder, std::string_view code);

  // The code of the language that most texts are in.
  const std::string& language() const { return language_; }
  // The text `key` with its {placeholders} filled in; values have the form already. A key that no
  // dictionary has stands for itself, with the values behind it, so that nothing is lost.
  std::string say(TextForm form, std::string_view key, Values values = {}) const;
  // The heading of a report, by the name that report_list has for it; nothing for an unknown one.
  std::string report(std::string_view name) const;

  // As the report page shows them: 1.5 TiB with the language's decimal sign, 93.4%.
  std::string size(unsigned long long bytes) const;
  std::string percent(double value) const;

 private:
  using Group = std::map<std::string, std::string, std::less<>>;
  struct Dictionary {
    Group mail;
    Group reports;
  };
  static bool read(const std::string& path, Dictionary& dictionary);
  // Null when no dictionary has it.
  const std::string* find(Group Dictionary::*group, std::string_view key) const;
  std::string number(double value, int digits) const;

  std::vector<Dictionary> dictionaries_;  // the nearest first
  std::string language_ = "en";
};

}  // namespace report_format
