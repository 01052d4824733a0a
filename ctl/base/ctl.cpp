#include "base/ctl.hpp"

#include <algorithm>
#include <cstdio>
#include <cwchar>
#include <nlohmann/json.hpp>

#include "vorn/admin/messages.hpp"
#include "vorn/base/utf8.hpp"

namespace ctl {
namespace {

void append_escape(std::string& out, char32_t code) {
  char escape[12];
  std::snprintf(escape, sizeof escape, code < 0x100 ? "\\x%02x" : "\\u%04x",
                static_cast<unsigned>(code));
  out += escape;
}

// Line ends in the eyes of some terminals, and what turns the direction of the text around it.
constexpr bool is_layout(char32_t code) {
  return code == 0x061C || code == 0x200E || code == 0x200F || (code >= 0x2028 && code <= 0x202E) ||
         (code >= 0x2066 && code <= 0x2069) || code == 0xFEFF;
}

}  // namespace

std::vector<std::string> in_parse_order(std::vector<std::string> words) {
  const auto is_word = [](const std::string& word) { return !word.starts_with('-'); };
  const auto is_action = [](const std::string& word) {
    return std::find(kReportActions.begin(), kReportActions.end(), word) != kReportActions.end();
  };
  if (words.size() < 2 || words.front() != "reports") {
    return words;
  }
  const auto profile = std::find_if(words.begin() + 1, words.end(), is_word);
  if (profile == words.end()) {
    return words;
  }
  auto action = std::find_if(profile + 1, words.end(), is_action);
  if (action == words.end()) {
    action = profile + 1;  // the parser says that it is none
  }
  std::string named = kReportActions.front();
  if (action != words.end() && is_word(*action)) {
    named = *action;
    words.erase(action);
  }
  words.insert(words.begin() + 1, named);
  return words;
}

Failure host_failure(const std::string& otherwise) {
  const std::vector<std::string> messages = admin::take_messages();
  for (std::size_t i = 0; i + 1 < messages.size(); ++i) {
    warn(messages[i]);
  }
  return Failure(messages.empty() ? otherwise : messages.back());
}

std::string printable(std::string_view text) {
  std::string out;
  while (!text.empty()) {
    const host::Utf8Char found = host::utf8_at(text);
    if (found.length == 0) {
      append_escape(out, static_cast<unsigned char>(text.front()));
    } else if (host::is_control(found.code) || is_layout(found.code)) {
      append_escape(out, found.code);
    } else {
      out += text.substr(0, found.length);
    }
    text.remove_prefix(std::max<std::size_t>(found.length, 1));
  }
  return out;
}

std::string shell_word(const std::string& word) {
  constexpr const char* kPlain =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._-+@%/:,";
  if (!word.empty() && word.find_first_not_of(kPlain) == std::string::npos) {
    return word;
  }
  std::string quoted = "'";
  for (const char c : word) {
    quoted += c == '\'' ? "'\\''" : std::string(1, c);
  }
  return quoted + "'";
}

std::size_t display_width(std::string_view text) {
  std::size_t width = 0;
  while (!text.empty()) {
    const host::Utf8Char found = host::utf8_at(text);
    // Characters that this C library doesn't know take one column on most terminals.
    const int columns = found.length == 0 ? 1 : wcwidth(static_cast<wchar_t>(found.code));
    width += columns < 0 ? 1 : static_cast<std::size_t>(columns);
    text.remove_prefix(std::max<std::size_t>(found.length, 1));
  }
  return width;
}

void print_line(std::string_view line) {
  std::puts(printable(line).c_str());
}

void warn(std::string_view line) {
  std::fflush(stdout);
  std::fprintf(stderr, "vornctl: %s\n", printable(line).c_str());
}

void print_json(const nlohmann::ordered_json& json) {
  std::puts(json.dump(2, ' ', false, nlohmann::ordered_json::error_handler_t::replace).c_str());
}

void Table::add(std::vector<std::string> row) {
  std::transform(row.begin(), row.end(), row.begin(), printable);
  row.resize(columns_.size());
  rows_.push_back(std::move(row));
}

std::string Table::text() const {
  std::vector<std::vector<std::string>> lines(1);
  for (const Column& column : columns_) {
    lines.front().push_back(column.header);
  }
  lines.insert(lines.end(), rows_.begin(), rows_.end());
  std::vector<std::size_t> widths(columns_.size());
  for (const auto& line : lines) {
    for (std::size_t i = 0; i < line.size(); ++i) {
      widths[i] = std::max(widths[i], display_width(line[i]));
    }
  }
  std::string text;
  for (const auto& line : lines) {
    for (std::size_t i = 0; i < line.size(); ++i) {
      const std::string padding(widths[i] - display_width(line[i]), ' ');
      text += columns_[i].align == Align::right ? padding + line[i] : line[i] + padding;
      text += "  ";
    }
    text.erase(text.find_last_not_of(' ') + 1);
    text += '\n';
  }
  return text;
}

void Table::print() const {
  std::fputs(text().c_str(), stdout);
}

CLI::Option* add_profile_argument(CLI::App& command, std::string& profile) {
  return command.add_option("PROFILE", profile, "Name of the profile")->type_name("")->required();
}

CLI::Option* add_share_argument(CLI::App& command, std::string& share) {
  return command.add_option("SHARE", share, "Name of the share")->type_name("")->required();
}

void add_pairs(CLI::App& command) {
  command.add_option("KEY", "Key to change")->type_name("");
  command.add_option("VALUE", "Its new value; more pairs may follow")->type_name("");
  command.allow_extras();
}

std::vector<std::pair<std::string, std::string>> pairs_of(const CLI::App& command) {
  std::vector<std::string> words = command["KEY"]->results();
  // An option of several values would take "[a,b]" apart, so the other pairs are what is left.
  for (const std::vector<std::string>& more : {command["VALUE"]->results(), command.remaining()}) {
    words.insert(words.end(), more.begin(), more.end());
  }
  std::vector<std::pair<std::string, std::string>> pairs;
  for (std::size_t i = 0; i < words.size(); i += 2) {
    if (i + 1 == words.size()) {
      throw Failure("the key " + words.back() + " has no value; an empty one ('') unsets it",
                    kWrongUsage);
    }
    pairs.emplace_back(words[i], words[i + 1]);
  }
  return pairs;
}

CLI::Option* add_json_flag(CLI::App& command, bool& json) {
  return command.add_flag("--json", json, "Print JSON instead of a table");
}

}  // namespace ctl
