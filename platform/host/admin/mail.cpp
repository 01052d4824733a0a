#include "vorn/admin/mail.hpp"

#include <curl/curl.h>

#include <memory>

#include "admin/section_hash.hpp"
#include "config/password_file.hpp"
#include "mail/mail.hpp"

namespace admin {
namespace {

struct CurlCleanup {
  void operator()(CURL* curl) const { curl_easy_cleanup(curl); }
};

}  // namespace

std::vector<std::string> send_test_mail(const Section& profile) {
  return host::send_test_mail(profile.name.c_str(), hash_of(profile), host::MailLimits{});
}

std::string mail_server_of(const Section& profile) {
  return profile.value("smtp_url", "smtp://localhost:25");
}

std::string mail_server_problem(const Section& profile) {
  constexpr long kLimitMs = 10'000;
  const std::string url = mail_server_of(profile);
  char error[CURL_ERROR_SIZE] = "";
  const std::unique_ptr<CURL, CurlCleanup> curl(curl_easy_init());
  if (!curl) {
    return "no memory";
  }
  curl_easy_setopt(curl.get(), CURLOPT_URL, url.c_str());
  curl_easy_setopt(curl.get(), CURLOPT_PROTOCOLS_STR, "smtp,smtps");
  curl_easy_setopt(curl.get(), CURLOPT_PROXY, "");
  curl_easy_setopt(curl.get(), CURLOPT_NOSIGNAL, 1L);
  curl_easy_setopt(curl.get(), CURLOPT_QUICK_EXIT, 1L);
  curl_easy_setopt(curl.get(), CURLOPT_CONNECT_ONLY, 1L);
  curl_easy_setopt(curl.get(), CURLOPT_CONNECTTIMEOUT_MS, kLimitMs);
  curl_easy_setopt(curl.get(), CURLOPT_TIMEOUT_MS, kLimitMs);
  curl_easy_setopt(curl.get(), CURLOPT_ERRORBUFFER, static_cast<char*>(error));
  // Credentials travel encrypted, so a run asks for that, too.
  if (!profile.value("smtp_user").empty() && url.find("//localhost") == std::string::npos &&
      url.find("//127.") == std::string::npos) {
    curl_easy_setopt(curl.get(), CURLOPT_USE_SSL, static_cast<long>(CURLUSESSL_ALL));
  }
  const CURLcode code = curl_easy_perform(curl.get());
  if (code == CURLE_OK) {
    return "";
  }
  return error[0] != '\0' ? error : curl_easy_strerror(code);
}

bool is_mail_address(std::string_view text) {
  return host::valid_address(text);
}

std::string smtp_url_problem(const std::string& value) {
  return host::mail_host(value).empty()
             ? "is not smtp://host:port or smtps://host:port (a user goes into smtp_user)"
             : "";
}

std::string password_file_problem(const std::string& value) {
  std::string password;
  return host::password_problem(value, password);
}

}  // namespace admin
