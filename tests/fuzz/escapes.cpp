// Escapes of the page and the CSV files: a line with the quote and the buffer's size, then the
// text.
#include <algorithm>
#include <vector>

#include "base/formats.hpp"
#include "fuzz.hpp"
#include "vorn/base/utf8.hpp"
#include "vorn/report.h"

namespace {

constexpr std::size_t kRoomForDigest = 100;

bool is_utf8(std::string_view text) {
  while (!text.empty()) {
    const std::size_t length = host::utf8_at(text).length;
    if (length == 0) {
      return false;
    }
    text.remove_prefix(length);
  }
  return true;
}

void append_utf8(std::string& out, unsigned code) {
  if (code >= 0xDC80 && code <= 0xDCFF) {  // stands for a byte
    out += static_cast<char>(code - 0xDC00);
  } else if (code < 0x80) {
    out += static_cast<char>(code);
  } else if (code < 0x800) {
    out += {static_cast<char>(0xC0 | code >> 6), static_cast<char>(0x80 | (code & 0x3F))};
  } else {
    out += {static_cast<char>(0xE0 | code >> 12), static_cast<char>(0x80 | (code >> 6 & 0x3F)),
            static_cast<char>(0x80 | (code & 0x3F))};
  }
}

// What a browser reads between two `quote`s.
std::string read_js(std::string_view text, char quote) {
  std::string out;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    fuzz::require(text[i] != quote, "no quote ends the text");
    fuzz::require(text[i] != '<' && byte >= ' ' && byte != 0x7F, "nothing ends line or element");
    if (text[i] != '\\') {
      out += text[i];
      continue;
    }
    fuzz::require(++i < text.size(), "no escape is cut");
    if (text[i] == 'u') {
      fuzz::require(i + 4 < text.size(), "no escape is cut");
      append_utf8(
          out, static_cast<unsigned>(std::stoul(std::string(text.substr(i + 1, 4)), nullptr, 16)));
      i += 4;
    } else {
      const std::size_t named = std::string_view("nrt").find(text[i]);
      out += named == std::string_view::npos ? text[i] : "\n\r\t"[named];
    }
  }
  return out;
}

void check_js(const std::string& text, char quote, std::size_t size) {
  std::vector<char> out(size);
  const int length = VornQazEscChar(text.c_str(), out.data(), out.size(), quote);
  if (length < 0) {
    fuzz::require(size < kRoomForDigest, "whatever has room is written");
    return;
  }
  const std::string_view written(out.data(), static_cast<std::size_t>(length));
  fuzz::require(is_utf8(written), "it is UTF-8");
  std::string plain(written);
  // A letter or quote can't be read back where it is the quote itself, since its escape is one.
  if (quote == '\'' || quote == '"') {
    plain = read_js(written, quote);
    fuzz::require((host::escape_js(text, quote).size() >= size) != (plain == text),
                  "it reads back");
  }
}

void check_csv(const std::string& text, std::size_t size) {
  std::vector<char> out(size);
  const int length = VornQazFormatCsvString(text.c_str(), out.data(), out.size());
  if (length < 0) {
    fuzz::require(size < kRoomForDigest, "whatever has room is written");
    return;
  }
  std::string_view rest(out.data(), static_cast<std::size_t>(length));
  fuzz::require(rest.find_first_of("\t\n\v\f\r") == rest.npos, "no line or field ends");
  fuzz::require(!is_utf8(text) || is_utf8(rest), "no character is cut");
  const std::size_t first = std::min(rest.find_first_not_of(' '), rest.size());
  fuzz::require(first == rest.size() || std::string_view("=@").find(rest[first]) == rest.npos,
                "no formula begins");
  while (rest.find('"') != rest.npos) {
    rest.remove_prefix(rest.find('"'));
    fuzz::require(rest.starts_with("\"\""), "quotes come in pairs");
    rest.remove_prefix(2);
  }
}

}  // namespace

void fuzz::one(std::string_view input) {
  const std::string header = take_line(input);
  const char quote = header.empty() ? '\'' : header[0];
  const std::size_t size =
      1 + (header.size() < 2 ? 8191 : static_cast<unsigned char>(header[1]) * std::size_t{8});
  const std::string text(input.substr(0, input.find('\0')));
  check_js(text, quote, size);
  check_csv(text, size);
}
