#include "mail/mail_delivery.hpp"

#include <curl/curl.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <memory>
#include <string_view>

#include "base/host_log.hpp"
#include "mail/mail_message.hpp"

namespace host {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

struct CurlCleanup {
  void operator()(CURL* curl) const { curl_easy_cleanup(curl); }
};
using CurlPtr = std::unique_ptr<CURL, CurlCleanup>;

// One SMTP transaction per recipient, so that each refusal has a name; over one connection as long
// as the server keeps it.
class Delivery {
 public:
  Delivery(const MailServer& server, const MailText& mail, const MailLimits& limits)
      : limits_(limits), deadline_(Clock::now() + limits.total), header_(mail_header(mail)) {
    if (curl_ == nullptr) {
      return;
    }
    set_transport(server);
    body_ = mail_body(curl_.get(), mail.content);
    set(CURLOPT_MAIL_FROM, mail.from.c_str());
    set(CURLOPT_HTTPHEADER, header_.get());
    set(CURLOPT_MIMEPOST, body_.get());
    set(CURLOPT_HEADERFUNCTION, &Delivery::on_reply);
    set(CURLOPT_HEADERDATA, this);
    set(CURLOPT_ERRORBUFFER, static_cast<char*>(error_));
  }
  Delivery(const Delivery&) = delete;
  Delivery& operator=(const Delivery&) = delete;
  // libcurl's clean-up says QUIT and would wait two minutes for the answer of a server that has
  // gone silent, whatever the limits; with nothing more to read it waits for none.
  ~Delivery() {
    curl_socket_t open_socket = CURL_SOCKET_BAD;
    if (curl_ != nullptr &&
        curl_easy_getinfo(curl_.get(), CURLINFO_ACTIVESOCKET, &open_socket) == CURLE_OK &&
        open_socket != CURL_SOCKET_BAD) {
      shutdown(open_socket, SHUT_RD);
    }
  }

  enum class Result { sent, refused, unreachable };

  Result send(const std::string& recipient) {
    const auto left = std::chrono::duration_cast<milliseconds>(deadline_ - Clock::now());
    const SlistPtr recipients(curl_slist_append(nullptr, recipient.c_str()));
    reply_.clear();
    error_[0] = '\0';
    if (header_ == nullptr || body_ == nullptr || recipients == nullptr || left.count() <= 0) {
      std::snprintf(error_, sizeof error_, "no time or memory left");
      errno = ETIMEDOUT;
      return Result::unreachable;
    }
    set(CURLOPT_MAIL_RCPT, recipients.get());
    set(CURLOPT_CONNECTTIMEOUT_MS, static_cast<long>(std::min(limits_.connect, left).count()));
    set(CURLOPT_TIMEOUT_MS, static_cast<long>(std::min(limits_.transfer, left).count()));
    const CURLcode code = curl_easy_perform(curl_.get());
    set(CURLOPT_MAIL_RCPT, static_cast<curl_slist*>(nullptr));
    if (code == CURLE_OK) {
      return Result::sent;
    }
    return is_refusal(code) ? refusal() : unreachable(code);
  }

  // After a failure: the server's words, or libcurl's.
  const char* reason() const { return error_; }

 private:
  template <typename Value>
  void set(CURLoption option, Value value) {
    curl_easy_setopt(curl_.get(), option, value);
  }

  void set_transport(const MailServer& server) {
    set(CURLOPT_URL, server.url.c_str());
    set(CURLOPT_PROTOCOLS_STR, "smtp,smtps");
    set(CURLOPT_PROXY, "");
    set(CURLOPT_NOSIGNAL, 1L);
    // A name server that doesn't answer must not hold up the end of the run either.
    set(CURLOPT_QUICK_EXIT, 1L);
    if (!server.user.empty()) {
      set(CURLOPT_USERNAME, server.user.c_str());
      set(CURLOPT_PASSWORD, server.password.c_str());
    }
    if (server.is_loopback) {
      return;  // smtps:// is verified there too
    }
    // A password never travels in the clear or to a server that isn't the one named. Without one,
    // encryption is a bonus: many mail relays in a local network have no certificate to verify.
    const bool secret = !server.user.empty();
    set(CURLOPT_USE_SSL, static_cast<long>(secret ? CURLUSESSL_ALL : CURLUSESSL_TRY));
    if (!secret && server.url.starts_with("smtp:")) {
      set(CURLOPT_SSL_VERIFYPEER, 0L);
      set(CURLOPT_SSL_VERIFYHOST, 0L);
    }
  }

  // The server said no to this message, and may say yes to the next. 421 is "closing down".
  bool is_refusal(CURLcode code) const {
    return (code == CURLE_SEND_ERROR || code == CURLE_RECV_ERROR ||
            code == CURLE_WEIRD_SERVER_REPLY) &&
           (reply_.starts_with('4') || reply_.starts_with('5')) && !reply_.starts_with("421");
  }

  Result refusal() {
    std::snprintf(error_, sizeof error_, "%s", reply_.c_str());
    errno = EREMOTEIO;
    return Result::refused;
  }

  Result unreachable(CURLcode code) {
    long os_error = 0;
    curl_easy_getinfo(curl_.get(), CURLINFO_OS_ERRNO, &os_error);
    if (error_[0] == '\0') {
      std::snprintf(error_, sizeof error_, "%s", curl_easy_strerror(code));
    }
    if (code == CURLE_OPERATION_TIMEDOUT) {
      os_error = ETIMEDOUT;
    }
    errno = os_error != 0 ? static_cast<int>(os_error) : EIO;
    return Result::unreachable;
  }

  // Keeps the last reply line. 221 answers QUIT, after a refusal has already been decided.
  static size_t on_reply(char* line, size_t size, size_t count, void* self) {
    std::string_view text(line, size * count);
    text = text.substr(0, std::min(text.find_first_of("\r\n"), std::size_t{200}));
    if (!text.starts_with("221")) {
      static_cast<Delivery*>(self)->reply_ = text;
    }
    return size * count;
  }

  const MailLimits limits_;
  const Clock::time_point deadline_;
  std::string reply_;
  char error_[CURL_ERROR_SIZE] = "";
  const SlistPtr header_;
  const CurlPtr curl_{curl_easy_init()};  // behind what its cleanup still calls back for
  MimePtr body_;                          // goes before its transfer
};

}  // namespace

std::vector<std::string> deliver(const char* profile, const MailServer& server,
                                 const MailText& mail, const MailLimits& limits) {
  auto delivery = std::make_unique<Delivery>(server, mail, limits);
  const std::vector<std::string>& to = mail.to;
  std::vector<std::string> served;
  int error = 0;
  for (std::size_t i = 0; i < to.size(); ++i) {
    const Delivery::Result result = delivery->send(to[i]);
    if (result == Delivery::Result::sent) {
      served.push_back(to[i]);
      continue;
    }
    error = errno;
    if (result == Delivery::Result::unreachable) {
      log_line(
          "profile \"%s\": mail server %s can't be used (%s), %zu recipients not served; "
          "see to it, or run vornctl profile set %s smtp_url smtp://HOST:PORT",
          profile, server.url.c_str(), delivery->reason(), to.size() - i, profile);
      break;
    }
    log_line("profile \"%s\": mail server %s refused the mail to %s: %s", profile,
             server.url.c_str(), to[i].c_str(), delivery->reason());
  }
  delivery.reset();  // which has an errno of its own
  errno = error;
  return served;
}

}  // namespace host
