#include "mail/mail_message.hpp"

#include <openssl/evp.h>

#include <algorithm>
#include <array>
#include <utility>

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

SlistPtr mail_header(const MailText& text) {
  std::tm local{};
  localtime_r(&text.time, &local);
  // The process keeps the C locale, so the names of days and months are those of RFC 5322.
  std::array<char, 64> date{};
  std::strftime(date.data(), date.size(), "Date: %a, %d %b %Y %H:%M:%S %z", &local);
  SlistPtr header;
  for (const std::string& field :
       {std::string(date.data()), "From: " + text.from, "To: " + joined(text.to, ",\r\n "),
        "Message-ID: <" + text.message_id + ">", "Subject: " + header_text(text.content.subject),
        std::string("Auto-Submitted: auto-generated"),
        std::string("Content-Type: multipart/alternative")}) {
    curl_slist* longer = curl_slist_append(header.get(), field.c_str());
    if (longer == nullptr) {
      return nullptr;
    }
    static_cast<void>(header.release());
    header.reset(longer);
  }
  return header;
}

// libcurl takes a lone line feed for a byte like others.
MimePtr mail_body(CURL* curl, const MailContent& content) {
  MimePtr body(curl_mime_init(curl));
  for (const auto& [type, text] : {std::pair("text/plain; charset=UTF-8", &content.plain),
                                   std::pair("text/html; charset=UTF-8", &content.html)}) {
    std::string lines;
    for (const char c : *text) {
      lines += c == '\n' ? "\r\n" : std::string(1, c);
    }
    curl_mimepart* part = curl_mime_addpart(body.get());
    if (curl_mime_data(part, lines.data(), lines.size()) != CURLE_OK ||
        curl_mime_type(part, type) != CURLE_OK ||
        curl_mime_encoder(part, "quoted-printable") != CURLE_OK) {
      return nullptr;
    }
  }
  return body;
}

}  // namespace host
