#include "mail.hpp"

#include <curl/curl.h>
#include <sys/random.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <memory>
#include <optional>

#include "file_io.hpp"
#include "host_log.hpp"
#include "profile.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "words.hpp"

namespace host {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

struct CurlCleanup {
  void operator()(CURL* curl) const { curl_easy_cleanup(curl); }
};
struct SlistFree {
  void operator()(curl_slist* list) const { curl_slist_free_all(list); }
};
struct UrlCleanup {
  void operator()(CURLU* url) const { curl_url_cleanup(url); }
};
struct CurlFree {
  void operator()(char* text) const { curl_free(text); }
};
using CurlPtr = std::unique_ptr<CURL, CurlCleanup>;
using SlistPtr = std::unique_ptr<curl_slist, SlistFree>;
using UrlPtr = std::unique_ptr<CURLU, UrlCleanup>;

struct Server {
  std::string url;
  bool is_loopback = false;
  std::string user;  // empty: no log-in
  std::string password;
};

std::string value_of(const VLIBCSzHash& hash, const char* key) {
  const char* value = hash.find(key);
  return value == nullptr ? "" : value;
}

// The addresses of a comma-separated list; one log line for each that is none.
std::vector<std::string> addresses(const char* profile, std::string_view list) {
  std::vector<std::string> found;
  for (const std::string_view word : comma_words(list)) {
    const std::string address(word);
    if (std::find(found.begin(), found.end(), address) != found.end()) {
      continue;
    }
    if (valid_address(address)) {
      found.push_back(address);
    } else {
      log_line(R"(profile "%s": "%s" is no mail address; write name@domain in %s)", profile,
               address.c_str(), VORN_PATH_CONFIG);
    }
  }
  return found;
}

std::string url_part(CURLU* url, CURLUPart part) {
  char* text = nullptr;
  if (curl_url_get(url, part, &text, 0) != CURLUE_OK) {
    return {};
  }
  const std::unique_ptr<char, CurlFree> owner(text);
  return text;
}

bool is_loopback_host(const std::string& host) {
  return host == "localhost" || host == "[::1]" || host.ends_with(".localhost") ||
         (host.starts_with("127.") && host.find_first_not_of("0123456789.") == std::string::npos);
}

bool parse_server(const char* profile, const std::string& text, Server& server) {
  const std::string host = mail_host(text);
  if (host.empty()) {
    log_line(
        "profile \"%s\": smtp_url \"%s\" is not smtp://host:port or smtps://host:port; "
        "correct it in %s (a user goes into smtp_user)",
        profile, text.c_str(), VORN_PATH_CONFIG);
    return false;
  }
  server.url = text;
  server.is_loopback = is_loopback_host(host);
  return true;
}

bool read_credentials(const char* profile, const VLIBCSzHash& hash, Server& server) {
  server.user = value_of(hash, "smtp_user");
  if (server.user.empty()) {
    return true;
  }
  const std::string path = value_of(hash, "smtp_password_file");
  if (const char* problem = password_problem(path, server.password); problem != nullptr) {
    log_line(R"(profile "%s": smtp_password_file "%s" %s)", profile, path.c_str(), problem);
    return false;
  }
  return true;
}

// The kernel takes any bytes for a host name; a header takes only these.
std::string host_name() {
  char name[256] = "";
  static_cast<void>(gethostname(name, sizeof name - 1));
  std::string host = name;
  const auto is_odd = [](char c) {
    return std::isalnum(static_cast<unsigned char>(c)) == 0 && c != '.' && c != '-';
  };
  host.erase(std::remove_if(host.begin(), host.end(), is_odd), host.end());
  return host.empty() ? "localhost" : host;
}

// One SMTP transaction per recipient, so that each refusal has a name; over one connection as long
// as the server keeps it.
class Delivery {
 public:
  Delivery(const Server& server, const std::string& from, const std::string& message,
           const MailLimits& limits)
      : message_(message), limits_(limits), deadline_(Clock::now() + limits.total) {
    if (curl_ == nullptr) {
      return;
    }
    set_transport(server);
    set(CURLOPT_MAIL_FROM, from.c_str());
    set(CURLOPT_UPLOAD, 1L);
    set(CURLOPT_READFUNCTION, &Delivery::on_read);
    set(CURLOPT_READDATA, this);
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
    read_ = 0;
    error_[0] = '\0';
    if (curl_ == nullptr || recipients == nullptr || left.count() <= 0) {
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

  void set_transport(const Server& server) {
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

  static size_t on_read(char* buffer, size_t size, size_t count, void* self) {
    auto& delivery = *static_cast<Delivery*>(self);
    const std::size_t wanted = std::min(size * count, delivery.message_.size() - delivery.read_);
    delivery.message_.copy(buffer, wanted, delivery.read_);
    delivery.read_ += wanted;
    return wanted;
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

  const std::string& message_;
  const MailLimits limits_;
  const Clock::time_point deadline_;
  std::size_t read_ = 0;
  std::string reply_;
  char error_[CURL_ERROR_SIZE] = "";
  const CurlPtr curl_{curl_easy_init()};  // last, since its cleanup still calls back
};

int deliver_to_all(const char* profile, const MailText& text, const Server& server,
                   const MailLimits& limits) {
  const std::string message = mail_message(text);
  auto delivery = std::make_unique<Delivery>(server, text.from, message, limits);
  int served = 0;
  int error = 0;
  for (std::size_t i = 0; i < text.to.size(); ++i) {
    const Delivery::Result result = delivery->send(text.to[i]);
    if (result == Delivery::Result::sent) {
      ++served;
      continue;
    }
    error = errno;
    if (result == Delivery::Result::unreachable) {
      log_line(
          "profile \"%s\": mail server %s can't be used (%s), %zu recipients not served; "
          "check smtp_url in %s",
          profile, server.url.c_str(), delivery->reason(), text.to.size() - i, VORN_PATH_CONFIG);
      break;
    }
    log_line("profile \"%s\": mail server %s refused the mail to %s: %s", profile,
             server.url.c_str(), text.to[i].c_str(), delivery->reason());
  }
  delivery.reset();  // which has an errno of its own
  errno = error;
  return served > 0 ? 0 : -1;
}

std::string new_message_id(std::time_t now, const std::string& host) {
  unsigned long long random = 0;
  if (getrandom(&random, sizeof random, 0) != sizeof random) {
    random = static_cast<unsigned long long>(Clock::now().time_since_epoch().count());
  }
  char id[64];
  std::snprintf(id, sizeof id, "%lld.%d.%016llx", static_cast<long long>(now),
                static_cast<int>(getpid()), random);
  return std::string(id) + "@" + host;
}

}  // namespace

// Only what names a server: a user, a path or options in the URL would change what libcurl does.
std::string mail_host(const std::string& smtp_url) {
  const UrlPtr url(curl_url());
  if (url == nullptr || curl_url_set(url.get(), CURLUPART_URL, smtp_url.c_str(), 0) != CURLUE_OK) {
    return {};
  }
  const std::string scheme = url_part(url.get(), CURLUPART_SCHEME);
  const std::string path = url_part(url.get(), CURLUPART_PATH);
  bool has_more = path != "/" && !path.empty();
  for (const CURLUPart part : {CURLUPART_USER, CURLUPART_PASSWORD, CURLUPART_OPTIONS,
                               CURLUPART_QUERY, CURLUPART_FRAGMENT}) {
    has_more = has_more || !url_part(url.get(), part).empty();
  }
  const bool is_mail = scheme == "smtp" || scheme == "smtps";
  return is_mail && !has_more ? url_part(url.get(), CURLUPART_HOST) : "";
}

const char* password_problem(const std::string& path, std::string& password) {
  struct stat status {};
  if (!path.starts_with('/')) {
    return "is not absolute; write smtp_password_file = /...";
  }
  if (stat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) {
    return "is no readable file; make one with the password as its first line";
  }
  if ((status.st_mode & S_IRWXO) != 0) {
    return "is open to every user; run chmod 600 on it";
  }
  constexpr std::size_t kLargestFile = 65536;
  const std::optional<std::string> content = read_file(path, kLargestFile);
  password = content.value_or("");
  password.resize(std::min(password.find_first_of("\r\n"), password.size()));
  return password.empty() ? "holds no password in its first line" : nullptr;
}

int send_report(const char* profile, const char* link, const VLIBCSzHash& hash,
                const MailLimits& limits) {
  const std::string wanted = value_of(hash, "mail_to");
  if (comma_words(wanted).empty()) {
    return 0;
  }
  errno = EINVAL;
  MailText text;
  text.profile = profile;
  text.link = link;
  text.host = host_name();
  text.reports = value_of(hash, "report_list");
  text.from = value_of(hash, "mail_from");
  text.from = text.from.empty() ? "vornreport@" + text.host : text.from;
  if (!valid_address(text.from)) {
    log_line(
        "profile \"%s\": mail_from \"%s\" is no mail address; write mail_from = name@domain "
        "in %s",
        profile, text.from.c_str(), VORN_PATH_CONFIG);
    return -1;
  }
  const std::string url = value_of(hash, "smtp_url");
  Server server;
  if (!parse_server(profile, url.empty() ? "smtp://localhost:25" : url, server) ||
      !read_credentials(profile, hash, server)) {
    return -1;
  }
  text.to = addresses(profile, wanted);
  if (text.to.empty()) {
    return -1;
  }
  text.time = std::time(nullptr);
  text.message_id = new_message_id(text.time, text.host);
  return deliver_to_all(profile, text, server, limits);
}

}  // namespace host

int VornQazSendReport(const char* profile, const char* link, const VLIBCSzHash* hash) try {
  if (link == nullptr || hash == nullptr || !host::valid_profile(profile)) {
    errno = EINVAL;
    return -1;
  }
  const int saved_errno = errno;
  const int result = host::send_report(profile, link, *hash, host::MailLimits{});
  if (result == 0) {
    errno = saved_errno;
  }
  return result;
} catch (...) {
  errno = ENOMEM;
  return -1;
}
