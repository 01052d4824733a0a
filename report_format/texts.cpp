#include "report_format/texts.hpp"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <ctime>
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
constexpr std::array kUnseen{
    Range{0xAD, 0xAD},       Range{0x600, 0x605},     Range{0x61C, 0x61C},
    Range{0x6DD, 0x6DD},     Range{0x70F, 0x70F},     Range{0x890, 0x891},
    Range{0x8E2, 0x8E2},     Range{0x180E, 0x180E},   Range{0x200B, 0x200F},
    Range{0x2028, 0x202E},   Range{0x2060, 0x206F},   Range{0xFEFF, 0xFEFF},
    Range{0xFFF9, 0xFFFB},   Range{0x110BD, 0x110BD}, Range{0x110CD, 0x110CD},
    Range{0x13430, 0x1343F}, Range{0x1BCA0, 0x1BCA3}, Range{0x1D173, 0x1D17A},
    Range{0xE0000, 0xE0FFF}};

bool is_unseen(char32_t code) {
  for (const Range& range : kUnseen) {
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
std::string filled(std::string_view text, const Texts::Values& values) {
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

constexpr std::string_view kMail = "mail";
constexpr std::string_view kFacts = "facts";
constexpr std::string_view kGroups[] = {kMail, "reports", kFacts, "attention", "incidents"};

std::string in_form(TextForm form, const std::string& own) {
  return form == TextForm::html ? escape_html(own) : own;
}

// The local day; of a time that no calendar has, the seconds.
std::string date_text(std::int64_t time) {
  const auto seconds = static_cast<std::time_t>(time);
  std::tm local{};
  char text[32];
  return localtime_r(&seconds, &local) != nullptr &&
                 std::strftime(text, sizeof text, "%Y-%m-%d", &local) > 0
             ? text
             : std::to_string(time);
}

std::uint64_t magnitude(std::int64_t value) {
  const auto bits = static_cast<std::uint64_t>(value);
  return value < 0 ? 0 - bits : bits;
}

// Nothing for an absent value and for a text.
std::optional<std::int64_t> whole_number(const AttentionValue* value) {
  const auto* number = value == nullptr ? nullptr : std::get_if<std::int64_t>(value);
  return number == nullptr ? std::nullopt : std::optional(*number);
}

ValueKind kind_of(const AttentionFormat* format, std::string_view name,
                  const AttentionValue& value) {
  if (format != nullptr) {
    for (const ValueFormat& known : format->values) {
      if (known.name == name) {
        return known.kind;
      }
    }
  }
  return std::holds_alternative<std::string>(value) ? ValueKind::kName : ValueKind::kCount;
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
  for (const std::string_view name : kGroups) {
    const auto group = json.is_object() ? json.find(name) : json.end();
    if (group == json.end() || !group->is_object()) {
      continue;
    }
    for (const auto& [key, value] : group->items()) {
      if (value.is_string()) {
        dictionary[std::string(name)].emplace(key, value.get<std::string>());
      }
    }
  }
  return json.is_object();
}

const std::string* Texts::find(std::string_view group, std::string_view key) const {
  for (const Dictionary& dictionary : dictionaries_) {
    const auto texts = dictionary.find(group);
    if (texts == dictionary.end()) {
      continue;
    }
    if (const auto found = texts->second.find(key); found != texts->second.end()) {
      return &found->second;
    }
  }
  return nullptr;
}

std::string Texts::say(TextForm form, std::string_view group, std::string_view key,
                       const Values& values) const {
  if (const std::string* text = find(group, key); text != nullptr) {
    return filled(in_form(form, *text), values);
  }
  std::string text = name_in(form, key);  // which facts may have brought along
  for (const auto& [name, value] : values) {
    text += " " + value;
  }
  return text;
}

std::string Texts::report(std::string_view name) const {
  const std::string* text = find("reports", name);
  return text == nullptr ? "" : *text;
}

// --- Values -------------------------------------------------------------------------------------

// As the page's script rounds: a half goes up. The wider type holds the product exactly, so that a
// half is one and nothing else is.
std::string Texts::number(double value, int digits) const {
  long double scale = 1;
  for (int i = 0; i < digits; ++i) {
    scale *= 10;
  }
  char text[64];
  std::snprintf(text, sizeof text, "%.*Lf", digits,
                std::round(static_cast<long double>(value) * scale) / scale);
  std::string number = text;
  if (const std::size_t point = number.find('.'); point != std::string::npos) {
    number.erase(std::max(number.find_last_not_of('0'), point - 1) + 1);
    if (number.back() == '.') {
      number.pop_back();
    }
  }
  const std::string* sign = find(kMail, "decimal");
  replace_all(number, ".", sign == nullptr ? "." : *sign);
  return number;
}

std::string Texts::size(std::uint64_t bytes) const {
  constexpr std::array kUnits{"", "Ki", "Mi", "Gi", "Ti", "Pi", "Ei"};
  constexpr double kUnit = 1024.0;
  constexpr double kNearlyOne = 1023.5;  // which would show as 1024
  auto count = static_cast<double>(bytes);
  std::size_t unit = 0;
  while (count >= kNearlyOne && unit + 1 < kUnits.size()) {
    count /= kUnit;
    ++unit;
  }
  return number(count, count < 10    ? 2
                       : count < 100 ? 1
                                     : 0) +
         "\u00a0" + kUnits[unit] + (find(kFacts, "unit") == nullptr ? "B" : *find(kFacts, "unit"));
}

std::string Texts::percent(double value) const {
  constexpr double kNearlyAll = 99.9;
  const double shown = value < 100 ? std::min(value, kNearlyAll) : value;
  return say(TextForm::plain, kMail, "percent", {{"n", number(shown, 1)}});
}

std::string Texts::value_in(TextForm form, ValueKind kind, const AttentionValue& value) const {
  if (const auto* text = std::get_if<std::string>(&value); text != nullptr) {
    return name_in(form, *text);
  }
  constexpr double kMostBytes = 0x1p63;
  const auto* whole = std::get_if<std::int64_t>(&value);
  const double real = whole != nullptr ? static_cast<double>(*whole) : std::get<double>(value);
  switch (kind) {
    case ValueKind::kBytes:
      return in_form(form, size(static_cast<std::uint64_t>(std::clamp(real, 0.0, kMostBytes))));
    case ValueKind::kPercent:
      return in_form(form, percent(real));
    case ValueKind::kTime:
      return whole != nullptr ? date_text(*whole) : number(real, 0);
    case ValueKind::kName:
    case ValueKind::kDays:
    case ValueKind::kCount:
      break;
  }
  return whole != nullptr ? std::to_string(*whole) : in_form(form, number(real, 1));
}

// --- Sentences ----------------------------------------------------------------------------------

std::string Texts::fills(TextForm form, const Fill& fill) const {
  constexpr std::int64_t kMostDays = 730;  // beyond that, years
  constexpr double kYear = 365.25;
  const bool in_years = fill.days >= kMostDays;
  const auto shown = [in_years](std::int64_t days) {
    return std::to_string(in_years ? std::llround(static_cast<double>(days) / kYear) : days);
  };
  return say(form, kFacts,
             fill.days <= 0   ? "fillsToday"
             : fill.days == 1 ? "fillsDay"
             : in_years       ? "fillsYears"
                              : "fillsDays",
             {{"n", shown(fill.days)}, {"low", shown(fill.low)}, {"high", shown(fill.high)}});
}

std::string Texts::too_short(TextForm form, const VolumeFacts& volume) const {
  const std::int64_t window = volume.forecast.window;
  const bool is_span = window < kShortestWindow;
  const auto had = is_span ? window : static_cast<std::int64_t>(volume.samples.size());
  return say(form, kFacts, is_span ? "shortSpan" : "shortDays",
             {{"n", std::to_string(had)},
              {"m", std::to_string(is_span ? kShortestWindow : kFewestSamples)}});
}

std::string Texts::outlook(TextForm form, const VolumeFacts& volume) const {
  const Forecast& forecast = volume.forecast;
  if (volume.size == 0) {
    return say(form, kFacts, "unknownSize");
  }
  switch (forecast.state) {
    case ForecastState::kFull:
      return say(form, kFacts, "full");
    case ForecastState::kShort:
      return too_short(form, volume);
    case ForecastState::kShrinking:
      return say(form, kFacts, "shrinking");
    case ForecastState::kSteady:
      return say(form, kFacts, "steady");
    case ForecastState::kGrowing:
      break;
  }
  if (!forecast.days) {
    return {};
  }
  const std::int64_t days = *forecast.days;
  return fills(form, {days, forecast.days_low.value_or(days), forecast.days_high.value_or(days)});
}

std::string Texts::basis(TextForm form, const VolumeFacts& volume) const {
  const Forecast& forecast = volume.forecast;
  std::string text;
  if (forecast.state == ForecastState::kGrowing && volume.size > 0) {
    text = say(form, kFacts, "pace", {{"n", std::to_string(forecast.window)}});
  }
  if (forecast.jump) {
    const std::string jump = say(form, kFacts, forecast.jump->bytes < 0 ? "fell" : "jumped",
                                 {{"size", in_form(form, size(magnitude(forecast.jump->bytes)))},
                                  {"date", date_text(forecast.jump->date)}});
    text += (text.empty() ? "" : say(form, kMail, "separator")) + jump;
  }
  return text;
}

std::string Texts::attention(TextForm form, const Attention& entry) const {
  const AttentionFormat* format = find_attention(entry.code);
  Values values;
  for (const auto& [name, value] : entry.values) {
    values.emplace_back(name, value_in(form, kind_of(format, name, value), value));
  }
  if (const auto days = whole_number(entry.find("days"))) {
    const auto or_days = [&](const char* name) {
      return whole_number(entry.find(name)).value_or(*days);
    };
    values.emplace_back("outlook", fills(form, {*days, or_days("days_low"), or_days("days_high")}));
  }
  return say(form, "attention", entry.code, values);
}

std::string Texts::incident(TextForm form, const Incident& incident) const {
  constexpr std::string_view kGroup = "incidents";
  return find(kGroup, incident.kind) == nullptr
             ? name_in(form, incident.text)
             : say(form, kGroup, incident.kind, {{"what", name_in(form, incident.what)}});
}

}  // namespace report_format
