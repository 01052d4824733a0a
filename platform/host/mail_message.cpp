#include <algorithm>
#include <array>

#include "mail.hpp"

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

std::string mail_message(const MailText& text) {
  std::tm local{};
  localtime_r(&text.time, &local);
  // The process keeps the C locale, so the names of days and months are those of RFC 5322.
  std::array<char, 32> when{};
  std::array<char, 64> date{};
  std::strftime(when.data(), when.size(), "%Y-%m-%d %H:%M:%S", &local);
  std::strftime(date.data(), date.size(), "%a, %d %b %Y %H:%M:%S %z", &local);
  const std::string body = "The storage report \"" + text.profile + "\" of " + text.host +
                           " is ready.\n\n" + text.link + "\n\nMade: " + when.data() +
                           "\nReports: " + text.reports + "\n";
  return std::string("Date: ") + date.data() + "\r\nFrom: " + text.from +
         "\r\nTo: " + joined(text.to, ",\r\n ") + "\r\nMessage-ID: <" + text.message_id +
         ">\r\nSubject: Storage report " + text.profile + " of " + text.host + ", " + when.data() +
         "\r\nAuto-Submitted: auto-generated"
         "\r\nMIME-Version: 1.0"
         "\r\nContent-Type: text/plain; charset=UTF-8"
         "\r\nContent-Transfer-Encoding: quoted-printable\r\n\r\n" +
         quoted_printable(body);
}

}  // namespace host
