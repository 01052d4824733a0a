// What is said of facts, in words of a dictionary.
#include "report_format/texts.hpp"

#include <gtest/gtest.h>

#include <regex>

#include "dictionaries.hpp"

namespace {

using namespace report_format;
using enum ForecastState;

constexpr std::int64_t kGiB = std::int64_t{1} << 30U;
constexpr std::int64_t kNoon = 1763463600;  // of 2025-11-18 in UTC, 11:00

class TextsTest : public testing::Test {
 protected:
  TextsTest() { support::write_dictionaries(folder_.path()); }
  Texts texts(std::string_view language = "en") const { return {folder_.path(), language}; }

 private:
  support::TempFolder folder_;
};

VolumeFacts volume(ForecastState state, std::optional<std::int64_t> days = {}, std::int64_t low = 0,
                   std::int64_t high = 0) {
  VolumeFacts facts;
  facts.size = 100;
  facts.forecast.state = state;
  facts.forecast.window = 30;
  if (days) {
    facts.forecast.days = days;
    facts.forecast.days_low = low;
    facts.forecast.days_high = high;
  }
  return facts;
}

TEST_F(TextsTest, TellAVolumesOutlook) {
  VolumeFacts unknown = volume(kFull);
  unknown.size = 0;
  VolumeFacts young = volume(kShort);
  young.forecast.window = 3;
  VolumeFacts sparse = volume(kShort);
  sparse.samples.resize(2);
  const std::pair<VolumeFacts, const char*> cases[] = {
      {unknown, "size unknown"},
      {volume(kFull), "full"},
      {young, "too little history: 3 of 7 days"},
      {sparse, "too little history: samples of 2 of 4 days"},
      {volume(kShrinking), "shrinks"},
      {volume(kSteady), "does not grow"},
      {volume(kGrowing, 0, 0, 2), "full within a day"},
      {volume(kGrowing, 1, 1, 3), "full in about 1 day (1 to 3)"},
      {volume(kGrowing, 24, 19, 33), "full in about 24 days (19 to 33)"},
      {volume(kGrowing, 729, 700, 1461), "full in about 729 days (700 to 1461)"},
      {volume(kGrowing, 730, 548, 1461), "full in about 2 years (2 to 4)"},
      {volume(kGrowing), ""}};
  for (const auto& [facts, expected] : cases) {
    EXPECT_EQ(expected, texts().outlook(TextForm::plain, facts));
  }
  EXPECT_EQ("&lt;voll in&gt; 24 Tagen (19 bis 33)",
            texts("de-AT").outlook(TextForm::html, volume(kGrowing, 24, 19, 33)));
  EXPECT_EQ("full", texts("de").outlook(TextForm::plain, volume(kFull))) << "English stands behind";
}

TEST_F(TextsTest, TellWhatAnOutlookRestsOn) {
  const auto with_jump = [](ForecastState state, std::int64_t bytes) {
    VolumeFacts facts = volume(state, 24, 19, 33);
    facts.forecast.jump = Jump{kNoon, bytes};
    return facts;
  };
  const std::pair<VolumeFacts, const char*> cases[] = {
      {volume(kSteady), ""},
      {volume(kGrowing, 24, 19, 33), "at the pace of the last 30 days"},
      {with_jump(kSteady, 420 * kGiB), "jumped by 420\u00a0GiB on 2025-11-18"},
      {with_jump(kGrowing, -3 * kGiB / 2),
       "at the pace of the last 30 days, fell by 1.5\u00a0GiB on 2025-11-18"}};
  for (const auto& [facts, expected] : cases) {
    EXPECT_EQ(expected, texts().basis(TextForm::plain, facts));
  }
}

TEST_F(TextsTest, TellEachKindOfValueOfAttention) {
  const struct {
    const char* code;
    decltype(Attention::values) values;
    const char* expected;
  } cases[] = {
      {"volume_fills",
       {{"volume", "/srv"},
        {"days", std::int64_t{24}},
        {"days_low", std::int64_t{19}},
        {"days_high", std::int64_t{33}}},
       "/srv: full in about 24 days (19 to 33)"},
      {"volume_used",
       {{"volume", "/a\u202e\n"}, {"percent", 93.44}, {"free", kGiB}},
       "/aU+202EU+000A: 93.4% used, 1\u00a0GiB free"},
      {"quota_over",
       {{"user", "x{used}"}, {"volume", "/"}, {"used", 3 * kGiB}, {"quota", kGiB}},
       "x{used} is over the quota on /: 3\u00a0GiB of 1\u00a0GiB"},
      {"quota_more", {{"n", std::int64_t{1200}}}, "Further users near or over their quota: 1200"},
      {"data_oldest",
       {{"date", kNoon}, {"file", "\\xff<b>"}},
       "The oldest data is from 2025-11-18: \\xff<b>"},
      // What a later version or a hand has written.
      {"volume_fills", {{"volume", "/"}, {"days", "soon"}}, "/: {outlook}"},
      {"volume_used",
       {{"volume", std::int64_t{7}}, {"percent", "<"}, {"free", -1.0}},
       "7: < used, 0\u00a0B free"},
      {"news", {{"a", "b"}, {"c", std::int64_t{1}}, {"d", 1.25}}, "news b 1 1.3"}};
  for (const auto& [code, values, expected] : cases) {
    const Attention entry{Level::kWarning, code, values, ""};
    EXPECT_EQ(expected, texts().attention(TextForm::plain, entry));
  }
  const Attention hostile{Level::kWarning, "volume_used", {{"volume", "<i>"}}, ""};
  EXPECT_TRUE(texts().attention(TextForm::html, hostile).starts_with("<bdi>&lt;i&gt;</bdi>: "));
  const Attention unheard{Level::kWarning, "<i>", {}, ""};
  EXPECT_EQ("<bdi>&lt;i&gt;</bdi>", texts().attention(TextForm::html, unheard));
  EXPECT_EQ("/srv: zu 93,4\u00a0% belegt, 1,5\u00a0KiB frei",
            texts("de").attention(TextForm::plain,
                                  {Level::kWarning,
                                   "volume_used",
                                   {{"volume", "/srv"}, {"percent", 93.4}, {"free", 1536L}},
                                   ""}));
}

TEST_F(TextsTest, TellIncidentsInTheirOwnWordsAtLeast) {
  const Incident missing{IncidentLevel::kError, "share_missing", "a<b", "Its folder is gone."};
  EXPECT_EQ("Share a<b is missing from this report", texts().incident(TextForm::plain, missing));
  EXPECT_EQ("Freigabe <bdi>a&lt;b</bdi> fehlt", texts("de").incident(TextForm::html, missing));
  const Incident unheard{IncidentLevel::kError, "unheard", "x", "Something <else>."};
  EXPECT_EQ("Something <else>.", texts().incident(TextForm::plain, unheard));
}

// As format.js has them.
TEST_F(TextsTest, WriteSizesAndPercentagesAsThePageDoes) {
  const std::pair<std::uint64_t, const char*> sizes[] = {
      {0, "0 B"},         {1023, "1023 B"},      {1024, "1 KiB"},     {1152, "1.13 KiB"},
      {10239, "10 KiB"},  {101888, "99.5 KiB"},  {102912, "101 KiB"}, {1048063, "1023 KiB"},
      {1048064, "1 MiB"}, {UINT64_MAX, "16 EiB"}};
  for (const auto& [bytes, expected] : sizes) {
    EXPECT_EQ(std::regex_replace(expected, std::regex(" "), "\u00a0"), texts().size(bytes));
  }
  EXPECT_EQ("1,5\u00a0Kio", texts("fr").size(1536));
  const std::pair<double, const char*> percents[] = {{0, "0%"},        {93.44, "93.4%"},
                                                     {99.96, "99.9%"}, {100, "100%"},
                                                     {110.04, "110%"}, {12.25, "12.3%"}};
  for (const auto& [value, expected] : percents) {
    EXPECT_EQ(expected, texts().percent(value));
  }
}

}  // namespace
