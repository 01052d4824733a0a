// A message in the form in which libcurl sends it.
#ifndef VORN_HOST_MAIL_MESSAGE_HPP
#define VORN_HOST_MAIL_MESSAGE_HPP

#include <curl/curl.h>

#include <memory>
#include <string>
#include <string_view>

#include "mail/mail.hpp"

namespace host {

struct SlistFree {
  void operator()(curl_slist* list) const { curl_slist_free_all(list); }
};
struct MimeFree {
  void operator()(curl_mime* mime) const { curl_mime_free(mime); }
};
using SlistPtr = std::unique_ptr<curl_slist, SlistFree>;
using MimePtr = std::unique_ptr<curl_mime, MimeFree>;

// The header fields but for those of MIME. Null without memory.
SlistPtr mail_header(const MailText& text);

// Both forms of the content, for a transfer of `curl`, which must outlive it. Null without memory.
MimePtr mail_body(CURL* curl, const MailContent& content);

// `text` for an unstructured header field: as it is when it is printable ASCII, otherwise as
// encoded words on folded lines. Line ends and other control characters become blanks.
std::string header_text(std::string_view text);

}  // namespace host

#endif
