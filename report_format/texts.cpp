#include "report_format/texts.hpp"

#include <algorithm>
#include <array>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <optional>

#include "report_format/values.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/utf8.hpp"

namespace report_format {
namespace {

struct Range {
  char32_t first;
  char32_t last;
};

// What can't be seen, or turns the direction of the text around it: Unicode's categories Cf, Zl and
// Zp. Control characters are told by is_control().
constexpr std::array kFormats{
    Range{0xAD, 0xAD},       Range{0x600, 0x605},     Range{0x61C, 0x61C},
    Range{0x6DD, 0x6DD},     Range{0x70F, 0x70F},     Range{0x890, 0x891},
    Range{0x8E2, 0x8E2},     Range{0x180E, 0x180E},   Range{0x200B, 0x200F},
    Range{0x2028, 0x202E},   Range{0x2060, 0x206F},   Range{0xFEFF, 0xFEFF},
    Range{0xFFF9, 0xFFFB},   Range{0x110BD, 0x110BD}, Range{0x110CD, 0x110CD},
    Range{0x13430, 0x1343F}, Range{0x1BCA0, 0x1BCA3}, Range{0x1D173, 0x1D17A},
    Range{0xE0000, 0xE0FFF}};

bool is_unseen(char32_t code) {
  for (const Range& range : kFormats) {
    if (code >= range.first && code <= range.last) {
      return true;
    }
  }
  return host::is_control(code);
}

std::string visible(std::string_view name) {
  std::string out;
  while (!name.empty()) {
    const host::Utf8Char found = host::utf8_at(name);
    char code[16];
    if (found.length == 0) {
      std::snprintf(code, sizeof code, "\\x%02x", static_cast<unsigned char>(name.front()));
      out += code;
    } else if (is_unseen(found.code)) {
      std::snprintf(code, sizeof code, "U+%04X", static_cast<unsigned>(found.code));
      out += code;
    } else {
      out += name.substr(0, found.length);
    }
    name.remove_prefix(found.length == 0 ? 1 : found.length);
  }
  return out;
}

void replace_all(std::string& text, const std::string& what, const std::string& with) {
  for (std::size_t at = 0; (at = text.find(what, at)) != std::string::npos; at += with.size()) {
    text.replace(at, what.size(), with);
  }
}

// One pass, so that a value with braces in it stays what it is.
std::string filled(std::string_view text, Texts::Values values) {
  std::string out;
  while (!text.empty()) {
    const std::size_t open = std::min(text.find('{'), text.size());
    out += text.substr(0, open);
    text.remove_prefix(open);
    std::size_t taken = std::min(text.size(), std::size_t{1});
    std::string_view piece = text.substr(0, taken);
    for (const auto& [name, value] : values) {
      if (text.substr(taken).starts_with(name) &&
          text.substr(taken + name.size()).starts_with('}')) {
        piece = value;
        taken = name.size() + 2;
        break;
      }
    }
    out += piece;
    text.remove_prefix(taken);
  }
  return out;
}

}  // namespace

std::string escape_html(std::string_view text) {
  std::string out(text);
  replace_all(out, "&", "&amp;");
  replace_all(out, "<", "&lt;");
  replace_all(out, ">", "&gt;");
  replace_all(out, "\"", "&quot;");
  replace_all(out, "'", "&#39;");
  return out;
}

std::string name_in(TextForm form, std::string_view name) {
  const std::string text = visible(name);
  return form == TextForm::html ? "<bdi>" + escape_html(text) + "</bdi>" : text;
}

Texts::Texts(const std::string& folder, std::string_view code) {
  if (!is_language_code(code)) {
    code = "en";
  }
  std::string_view previous;
  for (const std::string_view name :
       {code, code.substr(0, code.find('-')), std::string_view("en")}) {
    Dictionary dictionary;
    if (name != std::exchange(previous, name) &&
        read(folder + "/" + std::string(name) + ".json", dictionary)) {
      language_ = dictionaries_.empty() ? name : language_;
      dictionaries_.push_back(std::move(dictionary));
    }
  }
}

bool Texts::read(const std::string& path, Dictionary& dictionary) {
  constexpr std::size_t kLargest = std::size_t{1} << 20U;
  const std::optional<std::string> text = host::read_file(path, kLargest);
  const auto json = nlohmann::json::parse(text.value_or(""), nullptr, false);
  for (const auto& [name, group] :
       {std::pair("mail", &dictionary.mail), std::pair("reports", &dictionary.reports)}) {
    if (!json.is_object() || !json.contains(name) || !json[name].is_object()) {
      continue;
    }
    for (const auto& [key, value] : json[name].items()) {
      if (value.is_string()) {
        group->emplace(key, value.get<std::string>());
      }
    }
  }
  return json.is_object();
}

const std::string* Texts::find(Group Dictionary::*group, std::string_view key) const {
  for (const Dictionary& dictionary : dictionaries_) {
    const auto found = (dictionary.*group).find(key);
    if (found != (dictionary.*group).end()) {
      return &found->second;
    }
  }
  return nullptr;
}

std::string Texts::say(TextForm form, std::string_view key, Values values) const {
  if (const std::string* text = find(&Dictionary::mail, key); text != nullptr) {
    return filled(form == TextForm::html ? escape_html(*text) : *text, values);
  }
  std::string text(key);
  for (const auto& [name, value] : values) {
    text += " " + value;
  }
  return text;
}

std::string Texts::report(std::string_view name) const {
  const std::string* text = find(&Dictionary::reports, name);
  return text == nullptr ? "" : *text;
}

std::string Texts::number(double value, int digits) const {
  char text[64];
  std::snprintf(text, sizeof text, "%.*f", digits, value);
  std::string number = text;
  if (const std::size_t point = number.find('.'); point != std::string::npos) {
    number.erase(std::max(number.find_last_not_of('0'), point - 1) + 1);
    if (number.back() == '.') {
      number.pop_back();
    }
  }
  const std::string* sign = find(&Dictionary::mail, "decimal");
  replace_all(number, ".", sign == nullptr ? "." : *sign);
  return number;
}

std::string Texts::size(unsigned long long bytes) const {
  constexpr std::array kUnits{"B", "KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
  constexpr double kUnit = 1024.0;
  constexpr double kNearlyOne = 1023.95;  // which would show as 1024
  auto count = static_cast<double>(bytes);
  std::size_t unit = 0;
  while (count >= kNearlyOne && unit + 1 < kUnits.size()) {
    count /= kUnit;
    ++unit;
  }
  return number(count, count < 10 ? 2 : count < 100 ? 1 : 0) + "\u00a0" + kUnits[unit];
}

std::string Texts::percent(double value) const {
  return say(TextForm::plain, "percent", {{"n", number(value, 1)}});
}

}  // namespace report_format
