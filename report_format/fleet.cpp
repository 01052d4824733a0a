#include "report_format/fleet.hpp"

#include <algorithm>
#include <charconv>

namespace report_format {
namespace {

// The letter behind a backslash that stands for `c`; 0 for what stands for itself.
constexpr char letter_of(char c) {
  switch (c) {
    case '\0':
      return '0';
    case '\b':
      return 'b';
    case '\f':
      return 'f';
    case '\n':
      return 'n';
    case '\r':
      return 'r';
    case '\t':
      return 't';
    case '\\':
    case '\'':
      return c;
    default:
      return 0;
  }
}

constexpr char unescaped(char letter) {
  for (const char c : {'\0', '\b', '\f', '\n', '\r', '\t'}) {
    if (letter_of(c) == letter) {
      return c;
    }
  }
  return letter;
}

// Takes a literal in single quotes off the beginning of `text`.
bool take_literal(std::string_view& text, std::string& value) {
  if (!text.starts_with('\'')) {
    return false;
  }
  for (std::size_t i = 1; i < text.size(); ++i) {
    if (text[i] == '\'') {
      text.remove_prefix(i + 1);
      return true;
    }
    if (text[i] == '\\' && ++i < text.size()) {
      value += unescaped(text[i]);
    } else if (i < text.size()) {
      value += text[i];
    }
  }
  return false;
}

bool take(std::string_view& text, char c) {
  while (text.starts_with(' ')) {
    text.remove_prefix(1);
  }
  if (!text.starts_with(c)) {
    return false;
  }
  text.remove_prefix(1);
  while (text.starts_with(' ')) {
    text.remove_prefix(1);
  }
  return true;
}

}  // namespace

std::string fleet_column_names(const FleetTable& table) {
  std::string names;
  for (std::string_view rest = table.columns; !rest.empty();) {
    const std::string_view column = rest.substr(0, rest.find(", "));
    names += (names.empty() ? "" : ", ") + std::string(column.substr(0, column.find(' ')));
    rest.remove_prefix(std::min(column.size() + 2, rest.size()));
  }
  return names;
}

void append_fleet_text(std::string& out, std::string_view text) {
  std::size_t plain = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (const char letter = letter_of(text[i]); letter != 0) {
      out.append(text, plain, i - plain);
      out += '\\';
      out += letter;
      plain = i + 1;
    }
  }
  out.append(text, plain);
}

void append_binary_text(std::string& out, std::string_view text) {
  // Its length by seven bits a byte, the last ones first, all but the end with the eighth bit set.
  std::size_t length = text.size();
  for (; length > 0x7f; length >>= 7U) {
    out += static_cast<char>(0x80U | length);
  }
  out += static_cast<char>(length);
  out += text;
}

std::string fleet_literal(std::string_view text) {
  std::string literal = "'";
  append_fleet_text(literal, text);
  return literal += '\'';
}

void split_fleet_row(std::string& row, std::vector<char*>& fields) {
  fields.clear();
  char* to = row.data();
  char* field = to;
  const char* const end = row.data() + row.size();
  bool is_absent = false;
  const auto end_field = [&] {
    *to++ = '\0';
    fields.push_back(is_absent ? nullptr : field);
    field = to;
    is_absent = false;
  };
  for (const char* from = row.data(); from < end; ++from) {
    if (*from == '\t') {
      end_field();
    } else if (*from == '\\' && from + 1 < end) {
      ++from;
      is_absent = *from == 'N';
      *to++ = unescaped(*from);
    } else {
      *to++ = *from;
    }
  }
  end_field();  // the string has room for one more NUL
}

bool read_partition(std::string_view text, FleetPartition& partition) {
  partition = {};
  if (!take(text, '(') || !take_literal(text, partition.server) || !take(text, ',') ||
      !take_literal(text, partition.profile) || !take(text, ',')) {
    return false;
  }
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), partition.run);
  text.remove_prefix(static_cast<std::size_t>(end - text.data()));
  return error == std::errc() && text == ")";
}

std::string fleet_list(const std::vector<std::string>& values) {
  std::string list = "[";
  for (const std::string& value : values) {
    list += list.size() > 1 ? "," : "";
    list += fleet_literal(value);
  }
  return list += ']';
}

bool is_overdue(std::int64_t started, std::int64_t interval, std::int64_t now) {
  constexpr std::int64_t kDay = 86400;
  // Of the first one nothing is known; the rarest schedule that is usual runs once a week.
  return now - started > (interval > 0 ? interval : 7 * kDay) + kDay;
}

}  // namespace report_format
