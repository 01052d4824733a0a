// The link to a report and the mail that carries it, against a real mail server.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <regex>

#include "dictionaries.hpp"
#include "mail/mail.hpp"
#include "mail/mail_message.hpp"
#include "support.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

using support::make_hash;
using support::syslog_lines;
using support::syslog_text;
using Entries = std::vector<std::pair<std::string, std::string>>;

namespace {

// --- Link ---------------------------------------------------------------------------------------

std::string link_of(const Entries& profile, const std::string& file, size_t size = 1024) {
  std::string link(size, 'x');
  const int result =
      VornGetTargetLink(make_hash(profile).get(), file.c_str(), link.data(), link.size());
  link.resize(std::strlen(link.c_str()));
  return result == 0 ? link : "refused" + link;
}

TEST(TargetLink, StandsForTheReportFolder) {
  const support::TempFolder folder;
  const std::string base = folder.path("r\xc3\xa4 #1");
  const std::string rest = "/weekly/2024-02-29_17-30-00/report.html";
  const std::string page = base + rest;
  support::write_file(page, "<!doctype html>\n</html>\n");
  const std::string own = "file://" + folder.path("r%C3%A4%20%231") + rest;
  const std::pair<const char*, std::string> bases[] = {
      {"", own},
      {"https://files.example.com/reports", "https://files.example.com/reports" + rest},
      {"http://user@h:8080/a%20b/", "http://user@h:8080/a%20b" + rest},
      {"file:///mnt/reports", "file:///mnt/reports" + rest}};
  for (const auto& [link_base, expected] : bases) {
    EXPECT_EQ(expected, link_of({{"report_dir", base + "//"}, {"link_base", link_base}}, page));
  }
  EXPECT_EQ("", syslog_text());
  for (const char* bad :
       {"javascript:alert(1)", "ftp://h/x", "file://relative", "https:///x", "https://h/a b",
        "https://h/\"x", "https://h/'x", "https://h/?q", "https://h/\x01"}) {
    EXPECT_EQ("refused", link_of({{"report_dir", base}, {"link_base", bad}}, page));
    EXPECT_EQ(1U, syslog_lines().size()) << bad;
  }
  EXPECT_EQ("refused", link_of({{"report_dir", base}}, page, own.size()));
  EXPECT_EQ(own, link_of({{"report_dir", base}}, page, own.size() + 1));
  EXPECT_EQ("refused", link_of({{"report_dir", folder.path("other")}}, page));
  support::write_file(page, "<!doctype html>\n");
  EXPECT_EQ("refused", link_of({{"report_dir", base}}, page)) << "cut short";
}

TEST(TargetLink, OpensPageAndFactsToTheGroupOfTheFolder) {
  const support::TempFolder folder;
  const std::string report = folder.path("reports/weekly/now");
  support::write_file(report + "/report.html", "<!doctype html>\n</html>\n");
  support::write_file(report + "/elsewhere", "");
  const gid_t group = geteuid() == 0 ? 100 : getegid();  // only root can give files away
  ASSERT_EQ(0, chown(report.c_str(), static_cast<uid_t>(-1), group));
  ASSERT_EQ(0, chmod((report + "/elsewhere").c_str(), 0600));
  const auto make_link = [&] {
    return link_of({{"report_dir", folder.path("reports")}}, report + "/report.html");
  };
  std::filesystem::create_symlink(report + "/elsewhere", report + "/report.json");
  EXPECT_NE("refused", make_link());
  std::filesystem::remove(report + "/report.json");
  support::write_file(report + "/report.json", "{}");
  for (const char* name : {"/report.html", "/report.json"}) {
    ASSERT_EQ(0, chmod((report + name).c_str(), 0600));
  }
  EXPECT_NE("refused", make_link());
  for (const auto& [name, mode] :
       {std::pair("/report.html", 0640), {"/report.json", 0640}, {"/elsewhere", 0600}}) {
    const struct stat status = support::status_of(report + name);
    EXPECT_EQ(static_cast<mode_t>(mode), status.st_mode & 07777U) << name;
    EXPECT_EQ(mode == 0640 ? group : getegid(), status.st_gid) << name;
    EXPECT_EQ(geteuid(), status.st_uid) << name;
  }
  EXPECT_EQ("", syslog_text());
}

// --- Mail ---------------------------------------------------------------------------------------

// The server script as a child process; ended with the scope.
class MailServer {
 public:
  explicit MailServer(const std::string& options = "") {
    int ends[2];
    if (pipe(ends) != 0) {
      throw std::runtime_error("pipe");
    }
    const std::string script = VORN_TEST_SOURCE_DIR "/tests/platform/smtp_server.py";
    const std::string command = "exec " + script + " " + mails_.path() + " " + options;
    pid_ = support::fork_child([&] {
      dup2(ends[1], STDOUT_FILENO);
      return execl("/bin/sh", "sh", "-c", command.c_str(), nullptr);
    });
    close(ends[1]);
    char port[8] = "";
    EXPECT_GT(read(ends[0], port, sizeof port - 1), 0) << "the mail server doesn't start";
    close(ends[0]);
    port_ = std::to_string(std::strtol(port, nullptr, 10));
  }
  MailServer(MailServer&&) = delete;
  ~MailServer() {
    kill(pid_, SIGKILL);
    support::wait_child(pid_);
  }

  const std::string& port() const { return port_; }
  std::string url() const { return "smtp://127.0.0.1:" + port_; }
  // Message `n`, from 1.
  std::string mail(int n) const {
    return support::read_file(mails_.path(std::to_string(n) + ".eml"));
  }
  std::size_t count() const {
    return static_cast<std::size_t>(std::distance(
        std::filesystem::directory_iterator(mails_.path()), std::filesystem::directory_iterator()));
  }

 private:
  support::TempFolder mails_;
  pid_t pid_ = -1;
  std::string port_;
};

const std::string kDictionaries = VORN_PATH_TEMPLATE "/lang";

int send(Entries profile, const std::string& url, const char* to = "a@example.com") {
  profile.emplace_back("smtp_url", url);
  profile.emplace_back("mail_to", to);
  return VornQazSendReport("weekly", "https://h/r.html", make_hash(profile).get());
}

TEST(SendReport, SendsOneMessageToEachRecipientOnOneConnection) {
  const MailServer server;
  const support::TempFolder folder;
  const std::string long_link = "https://h/" + std::string(1000, 'x') + "?=.\n.\nend";
  const Entries profile = {{"mail_to", " a@example.com , b@example.com,,a@example.com"},
                           {"mail_from", "reports@example.com"},
                           {"report_list", "share_list,large_file"},
                           {"real_path_report_final", folder.path("report.html")},
                           {"smtp_url", server.url()}};
  report_format::Facts facts;
  facts.attention = {{report_format::Level::kOk,
                      "share_largest",
                      {{"share", "photos"}, {"bytes", std::int64_t{2048}}},
                      "share_list"}};
  support::write_file(folder.path("report.json"), to_line(facts));
  support::write_dictionaries(kDictionaries);
  ASSERT_EQ(0, VornQazSendReport("weekly", long_link.c_str(), make_hash(profile).get()));
  EXPECT_EQ("", syslog_text());
  ASSERT_EQ(2U, server.count());

  const std::regex form(
      "X-Test-From: reports@example\\.com\r\nX-Test-To: ([ab])@example\\.com\r\n"
      "X-Test-Port: (\\d+)\r\nX-Test-Secure: no\r\n"
      "Content-Type: multipart/alternative; boundary=(\\S+)\r\nMime-Version: 1\\.0\r\n"
      "Date: \\w{3}, \\d\\d \\w{3} \\d{4} \\d\\d:\\d\\d:\\d\\d [-+]\\d{4}\r\n"
      "From: reports@example\\.com\r\nTo: a@example\\.com,\r\n b@example\\.com\r\n"
      "Message-ID: <[^<>@ ]+@[^<>@ ]+>\r\n"
      "Subject: Storage report weekly of [-.\\w]+, \\d{4}-\\d\\d-\\d\\d \\d\\d:\\d\\d\r\n"
      "Auto-Submitted: auto-generated\r\n\r\n--\\3\r\n"
      "Content-Type: text/plain; charset=UTF-8\r\n"
      "Content-Transfer-Encoding: quoted-printable\r\n\r\n([^]*)\r\n--\\3\r\n"
      "Content-Type: text/html; charset=UTF-8\r\n"
      "Content-Transfer-Encoding: quoted-printable\r\n\r\n([^]*)\r\n--\\3--\r\n");
  std::string ports[2];
  for (int i = 0; i < 2; ++i) {
    const std::string mail = server.mail(i + 1);
    std::smatch parts;
    ASSERT_TRUE(std::regex_match(mail, parts, form)) << mail;
    EXPECT_EQ(i == 0 ? "a" : "b", parts[1]);
    ports[i] = parts[2];
    const std::regex soft_break("=\r\n");
    const std::string plain = std::regex_replace(parts[4].str(), soft_break, "");
    const std::string html = std::regex_replace(parts[5].str(), soft_break, "");
    for (const char* text : {"x?=3D.\r\n.\r\nend\r\n",  // a line of one dot must not end it
                             "The largest share is photos with 2=C2=A0KiB\r\n"}) {
      EXPECT_NE(std::string::npos, plain.find(text)) << plain;
    }
    EXPECT_NE(std::string::npos, html.find("<bdi>photos</bdi> with 2=C2=A0KiB")) << html;
  }
  EXPECT_EQ(ports[0], ports[1]);
}

TEST(SendReport, NeedsNoDictionary) {
  const MailServer server;
  support::write_file(kDictionaries + "/en.json", "{\"mail\": [");
  EXPECT_EQ(0, send({{"language", "../../etc"}}, server.url()));
  EXPECT_NE(std::string::npos, server.mail(1).find("Subject: subject weekly "));
  EXPECT_NE(std::string::npos, server.mail(1).find("\r\nhttps://h/r.html\r\n"));
}

TEST(SendTestMail, SaysWhoGetsNone) {
  const MailServer picky("--refuse b@example.com");
  const Entries profile = {{"mail_to", "a@example.com, b@example.com, c"},
                           {"smtp_url", picky.url()}};
  support::write_dictionaries(kDictionaries);
  const auto test = [](Entries entries) {
    entries.emplace_back("language", "de-AT");
    return host::send_test_mail("weekly", *make_hash(entries), host::MailLimits{});
  };
  EXPECT_EQ(std::vector<std::string>{"a@example.com"}, test(profile));
  const std::string log = syslog_text();
  EXPECT_NE(std::string::npos, log.find("b@example.com: 550 5.1.1 no mailbox")) << log;
  EXPECT_EQ(1, std::count(log.begin(), log.end(), '\n')) << log;
  EXPECT_NE(std::string::npos, picky.mail(1).find("Dies ist ein Test"));
  EXPECT_TRUE(test({}).empty());
  EXPECT_NE(std::string::npos, syslog_text().find("no recipients"));
}

TEST(SendReport, FailsWhenEveryRecipientIsRefused) {
  const MailServer server("--refuse '*'");
  EXPECT_EQ(-1, send({}, server.url(), "a@example.com,b@example.com"));
  EXPECT_EQ(0U, server.count());
  EXPECT_EQ(2U, syslog_lines().size());
}

TEST(SendReport, GivesUpOnAServerThatIsAbsentOrSilent) {
  const int listener = socket(AF_INET, SOCK_STREAM, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t length = sizeof address;
  auto* generic = reinterpret_cast<sockaddr*>(&address);
  ASSERT_EQ(0, bind(listener, generic, length));
  ASSERT_EQ(0, getsockname(listener, generic, &length));
  const std::string silent = "smtp://127.0.0.1:" + std::to_string(ntohs(address.sin_port));
  const MailServer slow("--wait 3600");
  const auto give_up = [](const std::string& url, int code) {
    EXPECT_TRUE(support::passes_in_child([&] {
      using std::chrono::milliseconds;
      alarm(30);  // a wait without bounds ends here
      EXPECT_EQ(-1, host::send_report(
                        "weekly", "l", *make_hash({{"smtp_url", url}, {"mail_to", "a@b.c,d@e.f"}}),
                        {}, {milliseconds(200), milliseconds(400), milliseconds(800)}));
      EXPECT_EQ(code, errno);
    })) << url;
    const std::string log = syslog_text();
    EXPECT_EQ(std::string::npos, log.find('\n')) << log;
    EXPECT_NE(std::string::npos, log.find("2 recipients not served")) << log;
  };
  give_up(silent, ECONNREFUSED);
  ASSERT_EQ(0, listen(listener, 5));
  give_up(silent, ETIMEDOUT);  // nobody greets
  give_up(slow.url(), ETIMEDOUT);
  close(listener);
}

TEST(SendReport, LogsInWithThePasswordOfASafeFile) {
  const support::TempFolder folder;
  const auto password_file = [&folder](const char* name, const char* text, mode_t mode) {
    support::write_file(folder.path(name), text);
    EXPECT_EQ(0, chmod(folder.path(name).c_str(), mode));
    return folder.path(name);
  };
  const std::string good = password_file("password", "s3cret: \"x\r\nsecond line\n", 0640);
  const MailServer server("--login 'joe:s3cret: \"x'");
  EXPECT_EQ(0, send({{"smtp_user", "joe"}, {"smtp_password_file", good}}, server.url()));
  EXPECT_EQ(-1, send({}, server.url())) << "the server wants a user";
  EXPECT_EQ(-1, send({{"smtp_user", "eve"}, {"smtp_password_file", good}}, server.url()));
  syslog_lines();
  for (const std::string& bad :
       {std::string(), std::string("password"), folder.path(), password_file("empty", "\nx", 0600),
        password_file("open", "s3cret: \"x", 0604), folder.path("absent")}) {
    EXPECT_EQ(-1, send({{"smtp_user", "joe"}, {"smtp_password_file", bad}}, server.url()));
    EXPECT_EQ(1U, syslog_lines().size()) << bad;
  }
  EXPECT_EQ(1U, server.count());
}

TEST(SendReport, EncryptsAsMuchAsThePasswordNeeds) {
  const support::TempFolder folder;
  const std::string pem = folder.path("server.pem");
  const std::string command =
      "/usr/bin/openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:prime256v1 -nodes -days 2 "
      "-subj /CN=test -keyout " +
      pem + " -out " + pem + ".crt 2>/dev/null && cat " + pem + ".crt >> " + pem;
  ASSERT_EQ(0, std::system(command.c_str()));
  support::write_file(folder.path("password"), "x");
  ASSERT_EQ(0, chmod(folder.path("password").c_str(), 0600));
  const Entries nobody;
  const Entries user = {{"smtp_user", "joe"}, {"smtp_password_file", folder.path("password")}};
  const MailServer plain;
  const MailServer starttls("--certificate " + pem);
  const MailServer smtps("--smtps --certificate " + pem);
  struct Case {
    const MailServer& server;
    const char* url;  // 0.0.0.0 leads here too, but isn't a name of this machine
    const Entries& profile;
    const char* secure;  // null: refused
  };
  const Case cases[] = {
      {plain, "smtp://0.0.0.0:", nobody, "no"},      {starttls, "smtp://0.0.0.0:", nobody, "yes"},
      {starttls, "smtp://127.0.0.1:", nobody, "no"}, {plain, "smtp://0.0.0.0:", user, nullptr},
      {starttls, "smtp://0.0.0.0:", user, nullptr},  {smtps, "smtps://127.0.0.1:", nobody, nullptr},
      {smtps, "smtps://0.0.0.0:", nobody, nullptr}};
  for (const auto& [server, url, profile, secure] : cases) {
    const std::size_t before = server.count();
    EXPECT_EQ(secure == nullptr ? -1 : 0, send(profile, url + server.port())) << url;
    const std::string log = syslog_text();
    ASSERT_EQ(before + (secure == nullptr ? 0 : 1), server.count()) << url << log;
    if (secure == nullptr) {
      EXPECT_TRUE(std::regex_search(log, std::regex("certificate|STARTTLS|SSL"))) << log;
    } else {
      const std::string mail = server.mail(static_cast<int>(server.count()));
      EXPECT_NE(std::string::npos, mail.find(std::string("Secure: ") + secure)) << url;
    }
  }
}

TEST(SendReport, RefusesWhatItCannotUse) {
  const MailServer server;
  for (const char* url :
       {"localhost:25", "http://localhost", "smtp://", "smtp://u:p@localhost", "smtp://h/path",
        "smtp://h:0x1", "smtp://h:99999", "smtp://h?x", "smtp://a b", "smtp://h;AUTH=PLAIN"}) {
    EXPECT_EQ(-1, send({}, url)) << url;
    EXPECT_EQ(1U, syslog_lines().size()) << url;
  }
  const struct {
    const char* from;
    const char* to;
    int result;
    std::size_t lines;
  } cases[] = {{"not an address", "a@example.com", -1, 1},
               {"", "x, <y@z>", -1, 2},
               {"", "x, a@example.com", 0, 1},
               {"", " , ", 0, 0}};
  for (const auto& [from, to, result, lines] : cases) {
    EXPECT_EQ(result, send({{"mail_from", from}}, server.url(), to)) << to;
    EXPECT_EQ(lines, syslog_lines().size()) << to;
  }
  EXPECT_EQ(1U, server.count());
  EXPECT_EQ(0, VornQazSendReport("weekly", "l", make_hash().get()));
}

TEST(MailAddress, IsPlainEnoughForAHeader) {
  EXPECT_TRUE(host::valid_address("first.last+tag@mail.example.com"));
  for (const char* address :
       {"", "a", "@b", "a@", "a@b@c", "a b@c", "a@b\r\nBcc: x@y", "\"a\"@b", "<a@b>", "a,b@c",
        "a@b\x7f", "\xc3\xa4@b", "-oX@b", "a@.b", "a@b.", "o/x=1@[host]"}) {
    EXPECT_FALSE(host::valid_address(address)) << address;
  }
  EXPECT_FALSE(host::valid_address(std::string(250, 'x') + "@b.cd"));
}

TEST(HeaderText, KeepsLinesShortAndCharactersWhole) {
  EXPECT_EQ("a b  Bcc: x", host::header_text("a b\r\nBcc: x"));
  EXPECT_EQ("=?UTF-8?B?w6Q=?=", host::header_text("\xc3\xa4"));
  EXPECT_EQ("=?UTF-8?B?PT8=?=", host::header_text("=?")) << "or a reader decodes it";
  const std::string words = host::header_text(std::string(38, 'x') + "\xc3\xa4");
  EXPECT_TRUE(words.ends_with("?=\r\n =?UTF-8?B?w6Q=?=")) << words;
}

}  // namespace
