#include "mail/mail.hpp"

#include <curl/curl.h>
#include <sys/random.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <memory>
#include <optional>

#include "base/host_log.hpp"
#include "config/password_file.hpp"
#include "config/profile.hpp"
#include "mail/mail_delivery.hpp"
#include "report_format/facts_file.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace host {
namespace {

struct UrlCleanup {
  void operator()(CURLU* url) const { curl_url_cleanup(url); }
};
struct CurlFree {
  void operator()(char* text) const { curl_free(text); }
};
using UrlPtr = std::unique_ptr<CURLU, UrlCleanup>;

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
      log_line(
          R"(profile "%s": "%s" is no mail address; run vornctl profile set %s mail_to NAME@DOMAIN)",
          profile, address.c_str(), profile);
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

bool parse_server(const char* profile, const std::string& text, MailServer& server) {
  const std::string host = mail_host(text);
  if (host.empty()) {
    log_line(
        "profile \"%s\": smtp_url \"%s\" is not smtp://host:port or smtps://host:port; "
        "run vornctl profile set %s smtp_url smtp://HOST:PORT (a user goes into smtp_user)",
        profile, text.c_str(), profile);
    return false;
  }
  server.url = text;
  server.is_loopback = is_loopback_host(host);
  return true;
}

bool read_credentials(const char* profile, const VLIBCSzHash& hash, MailServer& server) {
  server.user = value_of(hash, "smtp_user");
  if (server.user.empty()) {
    return true;
  }
  const std::string path = value_of(hash, "smtp_password_file");
  if (const std::string problem = password_problem(path, server.password); !problem.empty()) {
    log_line(R"(profile "%s": smtp_password_file "%s" %s)", profile, path.c_str(), problem.c_str());
    return false;
  }
  return true;
}

std::string host_name() {
  char name[256] = "";
  return VornQazGetHostName(name, sizeof name) > 0 ? name : "localhost";
}

std::string new_message_id(std::time_t now, const std::string& host) {
  unsigned long long random = 0;
  if (getrandom(&random, sizeof random, 0) != sizeof random) {
    random = static_cast<unsigned long long>(
        std::chrono::steady_clock::now().time_since_epoch().count());
  }
  char id[64];
  std::snprintf(id, sizeof id, "%lld.%d.%016llx", static_cast<long long>(now),
                static_cast<int>(getpid()), random);
  return std::string(id) + "@" + host;
}

std::string readable_time(std::time_t time) {
  std::tm local{};
  localtime_r(&time, &local);
  char text[32];
  return {text, std::strftime(text, sizeof text, "%Y-%m-%d %H:%M", &local)};
}

// What every mail of a profile needs before it has a content.
struct Posting {
  Posting(const char* profile, const VLIBCSzHash& hash, const EarlierRuns& earlier)
      : from(value_of(hash, "mail_from")),
        texts(VORN_PATH_TEMPLATE "/lang", value_of(hash, "language")),
        topic{profile,
              host_name(),
              readable_time(time),
              {},
              value_of(hash, "report_list"),
              earlier.unfinished == 0 ? "" : readable_time(earlier.unfinished),
              earlier.missed == 0 ? "" : readable_time(earlier.missed)} {
    from = from.empty() ? "vornreport@" + topic.host : from;
  }

  std::time_t time = std::time(nullptr);
  MailServer server;
  std::string from;
  std::vector<std::string> to;
  report_format::Texts texts;
  MailTopic topic;
};

// Nothing, after a log line, when the profile's settings can't send a mail to anybody.
std::optional<Posting> prepare(const char* profile, const VLIBCSzHash& hash,
                               const EarlierRuns& earlier = {}) {
  Posting posting(profile, hash, earlier);
  errno = EINVAL;
  if (!valid_address(posting.from)) {
    log_line(
        "profile \"%s\": mail_from \"%s\" is no mail address; run vornctl profile set %s "
        "mail_from NAME@DOMAIN",
        profile, posting.from.c_str(), profile);
    return std::nullopt;
  }
  const std::string url = value_of(hash, "smtp_url");
  if (!parse_server(profile, url.empty() ? "smtp://localhost:25" : url, posting.server) ||
      !read_credentials(profile, hash, posting.server)) {
    return std::nullopt;
  }
  posting.to = addresses(profile, value_of(hash, "mail_to"));
  return posting.to.empty() ? std::nullopt : std::optional(std::move(posting));
}

// Those who were served.
std::vector<std::string> send(const char* profile, const Posting& posting,
                              const MailContent& content, const MailLimits& limits) {
  return deliver(profile, posting.server,
                 {.from = posting.from,
                  .to = posting.to,
                  .time = posting.time,
                  .message_id = new_message_id(posting.time, posting.topic.host),
                  .content = content},
                 limits);
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

bool wants_mail(const VLIBCSzHash& hash) {
  return !comma_words(value_of(hash, "mail_to")).empty();
}

int send_report(const char* profile, const char* link, const VLIBCSzHash& hash,
                const LateNews& news, const MailLimits& limits) {
  if (!wants_mail(hash)) {
    return 0;
  }
  const std::optional<Posting> posting = prepare(profile, hash, news.earlier);
  if (!posting) {
    return -1;
  }
  MailTopic topic = posting->topic;
  topic.link = link;
  topic.is_missing_from_fleet = news.is_missing_from_fleet;
  const std::string page = value_of(hash, "real_path_report_final");
  const auto facts = report_format::read_facts(page.substr(0, page.rfind('/')));
  const MailContent content = report_mail(posting->texts, topic, facts);
  return send(profile, *posting, content, limits).empty() ? -1 : 0;
}

std::vector<std::string> send_failure(const char* profile, const VLIBCSzHash& hash,
                                      const EarlierRuns& earlier,
                                      const std::vector<std::string>& log,
                                      const MailLimits& limits) {
  const auto posting = wants_mail(hash) ? prepare(profile, hash, earlier) : std::nullopt;
  return posting
             ? send(profile, *posting, failure_mail(posting->texts, posting->topic, log), limits)
             : std::vector<std::string>{};
}

std::vector<std::string> send_test_mail(const char* profile, const VLIBCSzHash& hash,
                                        const MailLimits& limits) {
  if (!wants_mail(hash)) {
    log_line("profile \"%s\" has no recipients; run vornctl profile set %s mail_to NAME@DOMAIN",
             profile, profile);
    errno = EINVAL;
    return {};
  }
  const std::optional<Posting> posting = prepare(profile, hash);
  return posting ? send(profile, *posting, test_mail(posting->texts, posting->topic), limits)
                 : std::vector<std::string>{};
}

}  // namespace host
