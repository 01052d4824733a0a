// The figures of a finished report, and what a mail says of them.
#include "mail/mail_summary.hpp"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <regex>
#include <set>

#include "support.hpp"

namespace {

const std::string kDictionaries = VORN_TEST_SOURCE_DIR "/reportUI/template/lang";
const std::string kScript = "<script type='text/javascript'>\n";
const std::string kEnd = "</script>\n";

host::ReportFigures figures_of(const std::string& page) {
  const support::TempFolder folder;
  support::write_file(folder.path("report.html"), "<!DOCTYPE html>\n" + page + "</html>\n");
  return host::read_figures(folder.path("report.html").c_str());
}

std::string volumes(const std::string& days, const std::string& history = "") {
  return kScript +
         "var vornVolumeUsageData = [\n[ '/', 10 , 90, '10.0%', '-' ],\n[ '/srv', 936 , " +
         "64, '93.6%', '" + days + "' ],\n[ '/none', 0 , 0, '-nan%', '0' ]\n];\n" + kEnd +
         (history.empty() ? "" : kScript + "var vornVolumeUsageDataHistory = {\n" + history + kEnd);
}

std::string shares(const std::string& rows) {
  return kScript + "var vornShareListData = [\n" + rows + "\n];\n" + kEnd;
}

std::string quotas(const std::string& tables) {
  return kScript + "var vornQuotaUsageTable = {\n" + tables + "]}\n" + kEnd;
}

std::string duplicates(const std::string& rows, int match = 0) {
  return kScript + "var vornDuplicateHashMatch = " + std::to_string(match) +
         ";\nvar vornDuplicateFileData = [\n" + rows + "\n];\n" + kEnd;
}

// The lines of the mail's text between its first and its link, but for reports and time.
std::string lines_of(const host::ReportFigures& figures, const std::string& language = "en") {
  const report_format::Texts texts(kDictionaries, language);
  const std::string text =
      report_mail(texts, {"weekly", "files", "now", "https://h/", ""}, figures).plain;
  const std::size_t start = text.find("\n\n") + 2;
  const std::size_t end = text.rfind('\n', text.find("now", start));
  return end < start ? "" : text.substr(start, end - start);
}

TEST(MailSummary, TellsTheFiguresOfAReport) {
  // The newest sample, one of before, and one of a day before.
  const auto history = [](const std::string& before, const std::string& oldest) {
    return "'/' : [\n[ '200000', 10.0 ]\n],\n'/srv' : [\n[ '200000', 93.6 ],\n" + before +
           "[ '113600', " + oldest + " ]\n]\n};\n";
  };
  const std::string grown = history("[ '190000', 95.0 ],\n", "80.0");
  const std::string young = "'/srv' : [\n[ '200000', 93.6 ],\n[ '199999', 93.6 ]\n]\n};\n";
  const std::string volume = "Fullest volume: /srv (93.6%)";
  std::string many;
  for (int i = 0; i < 100; ++i) {
    many += (i == 0 ? "" : ",\n") + ("['u" + std::to_string(i)) + "', 100, 50, 50.0]";
  }
  std::string groups;
  for (int i = 1; i <= 200; ++i) {
    const std::string row = "[ '" + std::to_string(i) + "', 's', '/";
    groups += (i == 1 ? "" : ",\n") + row + "a', 1024, 1 ],\n" + row + "b', 1024, 1 ]";
  }
  const std::pair<std::string, std::string> cases[] = {
      {"", ""},
      {volumes("-"), volume},
      {volumes("12", grown), volume + "\nDays until full: 12"},
      {volumes("0", grown), volume + "\nDays until full: less than 1"},
      {volumes("0", history("", "94.0")), volume + "\nDays until full: no growth"},
      {volumes("0", history("", "93.59")), volume + "\nDays until full: no growth"},
      {volumes("40000", grown), volume + "\nDays until full: no growth"},
      {volumes("0", young), volume},
      {volumes("0", "' : [\n};\n"), volume},
      {shares("[ 'a', '/', '1' ],\n[ 'b, [c]', '/', '1610612736' ]"),
       "Largest share: b, [c] (1.5\u00a0GiB)"},
      {shares("[ 'a', '/', '1' ],\n[ 'b'"), ""},
      {shares("[ 'a', '/', '-1' ]"), ""},
      {shares("[ 'a', '/', '1' ]").substr(0, 70), ""},  // cut short
      // A block that was left open, and one behind it.
      {kScript + "var vornVolumeUsageData = [\n[ '/', 1 , 1, '50%', '-' ]" + "\n" +
           shares("[ 'a', '/', '1023' ]"),
       "Largest share: a (1023\u00a0B)"},
      {quotas("'/' : [\n['joe', 100, 90, 90.0],\n['none', 0, 5, -1.0]\n] , \n'/srv' : [\n"),
       "Users over 90% of their quota: none"},
      {quotas(
           "'/' : [\n['o'neil\\x', 1000, 905, 90.5],\n['b', 10, 11, 110.0]] , \n'/srv' : [\n"
           "['b', 100, 91, 91.0],\n['<c>\u202e\x01\xff', 1000, 999, 99.9],\n['d', 10, 10, 100],\n"
           "['e', 1000, 901, 90.1],\n['f', 1000, 902, 90.2]"),
       "Users over 90% of their quota: b (110%), d (100%), <c>U+202EU+0001\\xff (99.9%), o'neil\\x "
       "(90.5%), f (90.2%) and 1 more"},
      {quotas("'/' : [\n" + many),
       "Users over 90% of their quota: none (counting, on each volume, only the 100 users with the "
       "smallest usage)"},
      {quotas("'/' : [\n['joe', x, 90, 90.0]"), ""},
      // Three files of one content, one of them in two shares.
      {duplicates("[ '1', 's', '/s/\\'a,', 2000, 1 ],\n[ '1', 's', '/s/b', 2000, 1 ],\n"
                  "[ '1', 't', '/s/b', 2000, 1 ],\n[ '1', 't', '/s/c', 2000, 1 ],\n"
                  "[ '2', 's', '/s/\\\\', 96, 1 ],\n[ '2', 's', '/s/e', 96, 1 ]",
                  1),
       "Confirmed duplicates could free: 4\u00a0KiB"},
      {duplicates("[ '1', 's', '/a', '10', '1' ],\n[ '1', 't', '/a', '10', '1' ]"), ""},
      {duplicates(groups),
       "Possible duplicates could free: at least 200\u00a0KiB (counting only the first 200 "
       "groups)"},
      {duplicates("[ '1', 's', '/a', 10 ]"), ""}};
  for (const auto& [page, expected] : cases) {
    EXPECT_EQ(expected, lines_of(figures_of(page))) << page;
  }
  // Behind the first 64 MiB nothing is read.
  const std::string row = "[ '1', 's', '/a', 1, 1 ],\n";
  std::string rows = row + "[ '1', 's', '/b', 1, 1 ],\n";
  while (rows.size() < std::size_t{64} << 20U) {
    rows += row;
  }
  EXPECT_NE(std::string::npos, lines_of(figures_of(duplicates(rows))).find("at least 1\u00a0B"));
}

TEST(MailSummary, SpeaksEachLanguage) {
  const host::ReportFigures figures = {host::FullestVolume{"/srv", 93.64, host::Outlook::days, 12},
                                       host::LargestShare{"photos", 1610612736},
                                       host::QuotaFigures{{{"joe", 97.5}}, false},
                                       host::DuplicateFigures{1610612736, false, true}};
  nlohmann::json english;
  for (const std::string code : {"en", "de", "fr", "es", "ja", "zh"}) {
    const auto texts =
        nlohmann::json::parse(support::read_file(kDictionaries + "/" + code + ".json"))["mail"];
    english = code == "en" ? texts : english;
    const std::regex placeholder(R"(\{\w+\})");
    for (const auto& [key, text] : english.items()) {
      const auto placeholders = [&](const std::string& value) {
        const std::sregex_iterator begin(value.begin(), value.end(), placeholder);
        std::multiset<std::string> found;
        std::for_each(begin, {}, [&](const std::smatch& match) { found.insert(match.str()); });
        return found;
      };
      ASSERT_TRUE(texts.contains(key)) << code << " " << key;
      EXPECT_EQ(placeholders(text), placeholders(texts[key])) << code << " " << key;
    }
    EXPECT_EQ(english.size(), texts.size()) << code;
    EXPECT_EQ(std::string::npos, lines_of(figures, code).find_first_of("{}")) << code;
  }
  const std::pair<const char*, const char*> cases[] = {
      {"de-AT", "Vollstes Volume: /srv (93,6\u00a0%)"},
      {"zh", "使用率最高的卷：/srv（93.6%）"},
      {"ja", "最も使用率の高いボリューム: /srv (93.6%)"},
      {"xx", "Fullest volume: /srv (93.6%)"},
      {"en-much-too-long", "Fullest volume: /srv (93.6%)"}};
  for (const auto& [code, line] : cases) {
    const std::string lines = lines_of(figures, code);
    EXPECT_EQ(line, lines.substr(0, lines.find('\n')));
  }
}

TEST(MailSummary, KeepsHostileNamesOutOfTheHtml) {
  const std::string hostile = "</bdi><script src=\"https://x\">&'{value}\u202e\n";
  host::ReportFigures figures;
  figures.volume = host::FullestVolume{hostile, 50};
  figures.share = host::LargestShare{hostile, 1};
  figures.quota = host::QuotaFigures{{{hostile, 95}}, false};
  const report_format::Texts texts(kDictionaries, "en");
  const std::string html =
      report_mail(texts, {"p", "h", "now", "https://h/?a&b", "large_file," + hostile}, figures)
          .html;
  const std::string safe =
      "<bdi>&lt;/bdi&gt;&lt;script "
      "src=&quot;https://x&quot;&gt;&amp;&#39;{value}U+202EU+000A</bdi>";
  EXPECT_NE(std::string::npos, html.find(safe + " (50%)")) << html;
  EXPECT_NE(std::string::npos, html.find("href=\"https://h/?a&amp;b\"")) << html;
  EXPECT_FALSE(std::regex_search(html, std::regex("<script|<img|<link|url\\(|src=\"|\n\n")))
      << html;
  // Whatever a profile's list and the quota tool hold, it stays a small mail.
  figures.quota = host::QuotaFigures{{1000, {std::string(127, '\x01'), 95}}, true};
  EXPECT_LT(report_mail(
                texts, {"p", "h", "now", "l", std::string(200'000, '&') + std::string(99'999, ',')},
                figures)
                .html.size(),
            std::size_t{100} << 10U);
}

}  // namespace
