// What mail and terminal say of a run's facts, in the language of a profile: texts from the
// dictionaries that the report page has too.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "report_format/attention.hpp"
#include "report_format/facts.hpp"

namespace report_format {

// Where a text goes. Texts that come from elsewhere pass through name_in() for it.
enum class TextForm : std::uint8_t { plain, html };

// `name`, which may be any bytes, as a reader can't be misled by it: control and format characters
// (those that turn the direction of text among them) come out as U+202E, bytes that are no UTF-8 as
// \xff. In HTML it is escaped and keeps its direction to itself.
std::string name_in(TextForm form, std::string_view name);
// `text` with nothing left in it that HTML would take for its own.
std::string escape_html(std::string_view text);

class Texts {
 public:
  using Values = std::vector<std::pair<std::string_view, std::string>>;

  // The dictionaries of `folder` for the language `code`: de-AT, else de; behind them English. One
  // that is missing or no JSON counts as empty.
  Texts(const std::string& folder, std::string_view code);

  // The code of the language that most texts are in.
  const std::string& language() const { return language_; }
  // The text `key` of `group` ("mail", "reports", "facts", "attention" or "incidents") with its
  // {placeholders} filled in; values have the form already. A key that no dictionary has stands for
  // itself, with the values behind it, so that nothing is lost.
  std::string say(TextForm form, std::string_view group, std::string_view key,
                  const Values& values = {}) const;
  // The heading of a report, by the name that report_list has for it; nothing for an unknown one.
  std::string report(std::string_view name) const;

  // --- Values, as the report page shows them; the text is of no form yet
  // --------------------------

  std::string size(std::uint64_t bytes) const;  // 1.5 TiB with the language's decimal sign
  std::string percent(double value) const;      // 93.4%; never 100% for less

  // --- Sentences, without an end
  // ------------------------------------------------------------------

  // When a volume is full: "full in about 24 days (19 to 33)". Empty when damaged facts don't say.
  std::string outlook(TextForm form, const VolumeFacts& volume) const;
  // What that rests on: "at the pace of the last 30 days, jumped by 2 GiB on 2026-11-18"; may be
  // empty.
  std::string basis(TextForm form, const VolumeFacts& volume) const;
  std::string attention(TextForm form, const Attention& entry) const;
  // For a kind that no dictionary has its own English sentence.
  std::string incident(TextForm form, const Incident& incident) const;

 private:
  using Group = std::map<std::string, std::string, std::less<>>;
  using Dictionary = std::map<std::string, Group, std::less<>>;

  struct Fill {  // whole days
    std::int64_t days, low, high;
  };

  static bool read(const std::string& path, Dictionary& dictionary);
  // Null when no dictionary has it.
  const std::string* find(std::string_view group, std::string_view key) const;
  std::string number(double value, int digits) const;
  std::string value_in(TextForm form, ValueKind kind, const AttentionValue& value) const;
  std::string fills(TextForm form, const Fill& fill) const;
  std::string too_short(TextForm form, const VolumeFacts& volume) const;

  std::vector<Dictionary> dictionaries_;  // the nearest first
  std::string language_ = "en";
};

}  // namespace report_format
