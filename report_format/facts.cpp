#include "report_format/facts.hpp"

#include <algorithm>
#include <array>
#include <cstdio>

#include "vorn/base/utf8.hpp"

namespace report_format {

Level worst_level(const Facts& facts) {
  return facts.attention.empty() ? Level::kOk : facts.attention.front().level;
}

const char* word_of(Level level) {
  constexpr std::array kWords{"ok", "warning", "critical"};
  return kWords[static_cast<std::size_t>(level)];
}

const char* word_of(ForecastState state) {
  constexpr std::array kWords{"full", "short", "growing", "shrinking", "steady"};
  return kWords[static_cast<std::size_t>(state)];
}

const IncidentKind* find_incident_kind(std::string_view kind) {
  const auto* found =
      std::find_if(std::begin(kIncidentKinds), std::end(kIncidentKinds),
                   [kind](const IncidentKind& known) { return known.kind == kind; });
  return found == std::end(kIncidentKinds) ? nullptr : found;
}

const AttentionValue* Attention::find(std::string_view name) const {
  const auto found = std::find_if(values.begin(), values.end(),
                                  [name](const auto& value) { return value.first == name; });
  return found == values.end() ? nullptr : &found->second;
}

std::string facts_text(std::string_view name) {
  std::string text;
  while (!name.empty()) {
    const std::size_t length = host::utf8_at(name).length;
    if (length == 0) {
      char escape[8];
      std::snprintf(escape, sizeof escape, "\\x%02x", static_cast<unsigned char>(name.front()));
      text += escape;
    } else {
      text += name.substr(0, length);
    }
    name.remove_prefix(std::max<std::size_t>(length, 1));
  }
  return text;
}

}  // namespace report_format
