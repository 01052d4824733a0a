#include <openssl/evp.h>

#include <algorithm>
#include <array>

#include "mail/mail.hpp"
#include "vorn/base/utf8.hpp"

namespace host {
namespace {

std::string joined(const std::vector<std::string>& texts, std::string_view separator) {
  std::string all;
  for (const std::string& text : texts) {
    all += all.empty() ? std::string_view() : separator;
    all += text;
  }
  return all;
}

std::string base64(std::string_view bytes) {
  std::string text((bytes.size() + 2) / 3 * 4, '\0');
  // It writes a zero byte behind the text, where the string has one.
  EVP_EncodeBlock(reinterpret_cast<unsigned char*>(text.data()),
                  reinterpret_cast<const unsigned char*>(bytes.data()),
                  static_cast<int>(bytes.size()));
  return text;
}

}  // namespace

bool valid_address(std::string_view address) {
  constexpr std::size_t kLongest = 254;
  static constexpr std::string_view kForbidden = "\"'`<>()[]\\,;:";
  const std::size_t at = address.find('@');
  return address.size() <= kLongest && at != std::string_view::npos && at > 0 &&
         at + 1 < address.size() && address.find('@', at + 1) == std::string_view::npos &&
         address.front() != '-' && address[at + 1] != '.' && address.back() != '.' &&
         std::all_of(address.begin(), address.end(), [](char c) {
           return c > ' ' && c < 0x7F && kForbidden.find(c) == std::string_view::npos;
         });
}

std::string quoted_printable(std::string_view text) {
  constexpr std::size_t kLongestLine = 76;
  constexpr std::string_view kHex = "0123456789ABCDEF";
  std::string out;
  std::size_t column = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (c == '\n') {
      out += "\r\n";
      column = 0;
      continue;
    }
    const bool ends_line = i + 1 == text.size() || text[i + 1] == '\n';
    std::string word(1, c);
    if (c < ' ' || c >= 0x7F || c == '=' || (c == ' ' && ends_line)) {
      const auto byte = static_cast<unsigned char>(c);
      word = {'=', kHex[byte >> 4U], kHex[byte & 15U]};
    }
    if (column + word.size() >= kLongestLine) {  // room for the soft break's own sign
      out += "=\r\n";
      column = 0;
    }
    out += word;
    column += word.size();
  }
  return out;
}

std::string header_text(std::string_view text) {
  constexpr std::size_t kMostBytes = 39;  // 52 in base64: with frame and name of the field a line
  std::string line(text);
  const auto is_ascii_control = [](char c) { return (c >= 0 && c < ' ') || c == 0x7F; };
  const auto is_printable = [](char c) { return c >= ' ' && c < 0x7F; };
  std::replace_if(line.begin(), line.end(), is_ascii_control, ' ');
  const bool is_plain =
      line.find("=?") == std::string::npos && std::all_of(line.begin(), line.end(), is_printable);
  if (is_plain) {
    return line;
  }
  std::string words;
  for (std::string_view rest = line; !rest.empty();) {
    std::size_t taken = 0;
    while (taken < rest.size()) {
      // No word ends inside a character.
      const std::size_t length = std::max(utf8_at(rest.substr(taken)).length, std::size_t{1});
      if (taken + length > kMostBytes) {
        break;
      }
      taken += length;
    }
    words +=
        (words.empty() ? "=?UTF-8?B?" : "\r\n =?UTF-8?B?") + base64(rest.substr(0, taken)) + "?=";
    rest.remove_prefix(taken);
  }
  return words;
}

std::string mail_message(const MailText& text) {
  // Quoted-printable text can't hold it: after an equals sign stand digits or a line end.
  constexpr std::string_view kBoundary = "=_vornreport";
  const std::string delimiter = "\r\n--" + std::string(kBoundary);
  const auto part = [&](std::string_view type, std::string_view body) {
    return delimiter + "\r\nContent-Type: " + std::string(type) +
           "; charset=UTF-8\r\nContent-Transfer-Encoding: quoted-printable\r\n\r\n" +
           quoted_printable(body);
  };
  std::tm local{};
  localtime_r(&text.time, &local);
  // The process keeps the C locale, so the names of days and months are those of RFC 5322.
  std::array<char, 64> date{};
  std::strftime(date.data(), date.size(), "%a, %d %b %Y %H:%M:%S %z", &local);
  return std::string("Date: ") + date.data() + "\r\nFrom: " + text.from +
         "\r\nTo: " + joined(text.to, ",\r\n ") + "\r\nMessage-ID: <" + text.message_id +
         ">\r\nSubject: " + header_text(text.content.subject) +
         "\r\nAuto-Submitted: auto-generated"
         "\r\nMIME-Version: 1.0"
         "\r\nContent-Type: multipart/alternative; boundary=\"" +
         std::string(kBoundary) + "\"\r\n" + part("text/plain", text.content.plain) +
         part("text/html", text.content.html) + delimiter + "--\r\n";
}

}  // namespace host
