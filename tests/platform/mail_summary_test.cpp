// What a mail says of a report's facts.
#include "mail/mail_summary.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <nlohmann/json.hpp>
#include <regex>

#include "dictionaries.hpp"

namespace {

using namespace report_format;

const host::MailTopic kTopic = {"weekly", "files", "now", "https://h/?a&b", "share_list;,x"};

class MailSummary : public testing::Test {
 protected:
  MailSummary() { support::write_dictionaries(folder_.path()); }
  host::MailContent mail(const std::optional<Facts>& facts, const char* language = "en",
                         const host::MailTopic& topic = kTopic) const {
    return report_mail(Texts(folder_.path(), language), topic, facts);
  }

 private:
  support::TempFolder folder_;
};

Attention fills(Level level, const char* volume) {
  return {level,
          "volume_fills",
          {{"volume", volume}, {"days", 24L}, {"days_low", 19L}, {"days_high", 33L}},
          "volume_usage"};
}

Attention largest(const std::string& share) {
  return {Level::kOk, "share_largest", {{"share", share}, {"bytes", 1536L}}, "share_list"};
}

Incident missing(const char* share) {
  return {IncidentLevel::kError, "share_missing", share, "Its folder is gone; mount it."};
}
const Incident kPart = {IncidentLevel::kWarning, "share_part", "a: 7", "Look into the log."};

Facts facts_with(std::vector<Attention> attention, std::vector<Incident> incidents) {
  Facts facts;
  facts.attention = std::move(attention);
  facts.incidents = std::move(incidents);
  return facts;
}

TEST_F(MailSummary, SaysTheWorstThingFirst) {
  const std::string usual = "Storage report weekly of files, now";
  const std::string ready = "The storage report “weekly” of files is ready.";
  const std::string incomplete = "The storage report “weekly” of files is ready, but incomplete.";
  const std::string days = ": full in about 24 days (19 to 33)";
  const std::string about = " – storage report weekly of files";
  const std::string gone = "Share b is missing from this report";
  const std::string part = "Part of a share could not be read (a: 7)";
  const auto both = {fills(Level::kWarning, "/a"), fills(Level::kCritical, "/b")};
  std::string path = "/";
  while (path.size() < 400) {
    path += "ä";
  }
  const struct {
    std::optional<Facts> facts;
    std::string subject;
    std::string beginning;
  } cases[] = {{std::nullopt, usual, ready + "\n\nIts figures are missing"},
               {facts_with({}, {}), usual, ready},
               {facts_with({largest("a")}, {}), usual, ready},
               {facts_with(both, {}), "/a" + days + about, "/a" + days + "\n\n" + ready},
               {facts_with({largest("a"), fills(Level::kWarning, "/a")}, {}), "/a" + days + about,
                "/a" + days + "\n\n" + ready},
               {facts_with(both, {kPart, missing("b")}), "/a" + days + about + " – incomplete",
                "/a" + days + "\n\n" + incomplete},
               {facts_with({}, {kPart, missing("b")}), gone + about + " – incomplete",
                gone + "\n\n" + incomplete},
               {facts_with({}, {kPart}), part + about + " – incidents: 1", part + "\n\n" + ready},
               // 160 bytes at most, and no half character.
               {facts_with({fills(Level::kWarning, path.c_str())}, {}),
                path.substr(0, 159) + "…" + about, path + days}};
  for (const auto& [facts, subject, beginning] : cases) {
    const host::MailContent content = mail(facts);
    EXPECT_EQ(subject, content.subject);
    EXPECT_TRUE(content.plain.starts_with(beginning + "\n") ||
                content.plain.starts_with(beginning + ":"))
        << content.plain;
  }
}

TEST_F(MailSummary, TellsEachThingOnce) {
  Facts facts = facts_with({fills(Level::kCritical, "/a"), fills(Level::kWarning, "/b"),
                            largest("photos"), largest("b, [c]")},
                           {kPart, missing("b")});
  VolumeFacts volume;
  volume.path = "/a";
  volume.size = 100;
  volume.percent = 93.44;
  volume.forecast.state = ForecastState::kGrowing;
  volume.forecast.days = 24;
  volume.forecast.window = 30;
  facts.volumes = {volume, VolumeFacts()};
  facts.reports.resize(2);
  facts.reports[0].name = "volume_usage";
  facts.reports[1].name = "unheard_of";
  EXPECT_EQ(
      "/a: full in about 24 days (19 to 33)\n\n"
      "The storage report “weekly” of files is ready, but incomplete.\n\n"
      "Share b is missing from this report\n    Its folder is gone; mount it.\n"
      "Part of a share could not be read (a: 7)\n    Look into the log.\n\n"
      "/b: full in about 24 days (19 to 33)\n"
      "Most pressing volume: /a (93.4%), full in about 24 days (24 to 24), at the pace of the last "
      "30 days\n"
      "The largest share is photos with 1.5\u00a0KiB\n"
      "The largest share is b, [c] with 1.5\u00a0KiB\n"
      "Reports: Volumes, unheard_of\nMade: now\n\nhttps://h/?a&b\n",
      mail(facts).plain);
  // The same in the other form.
  std::string html = mail(facts).html;
  html = html.substr(html.find("<body"));
  for (const auto& [pattern, text] :
       {std::pair("</th>", ": "), {"<br>", "\n    "}, {"<[^>]*>", ""}, {"&amp;", "&"}}) {
    html = std::regex_replace(html, std::regex(pattern), text);
  }
  const auto lines_of = [](const std::string& text) {
    const std::regex line(".+");
    const std::sregex_iterator begin(text.begin(), text.end(), line);
    std::vector<std::string> lines;
    std::transform(begin, {}, std::back_inserter(lines), [](const auto& m) { return m.str(); });
    return lines;
  };
  EXPECT_EQ(lines_of(mail(facts).plain), lines_of(html));

  facts = facts_with({}, {{IncidentLevel::kWarning, "unheard", "x", "Only this."}});
  facts.volumes.emplace_back().path = "/c";
  EXPECT_EQ(
      "Only this.\n\nThe storage report “weekly” of files is ready.\n\nOnly this.\n\n"
      "Most pressing volume: /c, size unknown\nMade: now\n\nhttps://h/?a&b\n",
      mail(facts).plain);
  EXPECT_EQ(
      "The storage report “weekly” of files is ready.\n\n"
      "Its figures are missing: they could not be read from the report.\n"
      "Reports: Shares, x\nMade: now\n\nhttps://h/?a&b\n",
      mail(std::nullopt).plain);
}

// A test of the page compares the dictionaries with each other and looks for texts without a use.
TEST(MailTexts, AreThereWhereverTheyAreAskedFor) {
  const std::string root = VORN_TEST_SOURCE_DIR "/";
  const std::string sources = support::read_file(root + "platform/host/mail/mail_summary.cpp") +
                              support::read_file(root + "report_format/texts.cpp");
  const auto texts =
      nlohmann::json::parse(support::read_file(root + "reportUI/template/lang/en.json"))["mail"];
  const std::regex call(R"re((?:\b(?:say|about)\(|kMail, )\s*"(\w+)")re");
  for (std::sregex_iterator match(sources.begin(), sources.end(), call), end; match != end;
       ++match) {
    EXPECT_TRUE(texts.contains((*match)[1].str())) << (*match)[1];
  }
}

TEST_F(MailSummary, KeepsHostileNamesOutOfTheHtml) {
  const std::string hostile = "</bdi><script src=\"https://x\">&'{value}\u202e\n";
  Facts facts = facts_with({fills(Level::kWarning, hostile.c_str()), largest(hostile)},
                           {{IncidentLevel::kError, hostile, hostile, hostile}});
  facts.volumes.emplace_back().path = hostile;
  facts.reports.emplace_back().name = hostile;
  const std::string html = mail(facts).html;
  const std::string safe =
      "<bdi>&lt;/bdi&gt;&lt;script "
      "src=&quot;https://x&quot;&gt;&amp;&#39;{value}U+202EU+000A</bdi>";
  EXPECT_NE(std::string::npos, html.find("share is " + safe + " with ")) << html;
  EXPECT_NE(std::string::npos, html.find("href=\"https://h/?a&amp;b\"")) << html;
  EXPECT_FALSE(std::regex_search(html, std::regex("<script|<img|<link|url\\(|src=\"|\n\n")))
      << html;
  // Whatever facts and a profile's list hold, it stays a small mail.
  const std::string name(255, '\x01');
  const Facts many =
      facts_with({1000, {Level::kWarning, "quota_near", {{"user", name}, {"volume", "/"}}, ""}},
                 {1000, {IncidentLevel::kError, "share_missing", name, name}});
  const host::MailContent content = mail(many);
  EXPECT_LT(content.html.size(), std::size_t{200} << 10U);
  EXPECT_NE(std::string::npos, content.plain.find("\n… and 980 more\n"));
  EXPECT_NE(std::string::npos, content.plain.find("\n… and 979 more\n"));
  host::MailTopic topic = kTopic;
  topic.report_list = std::string(200'000, '&') + std::string(99'999, ',') + "x";
  EXPECT_LT(mail(std::nullopt, "en", topic).html.size(), std::size_t{10} << 10U);
}

}  // namespace
