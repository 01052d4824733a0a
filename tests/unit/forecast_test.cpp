// What is told of when a volume or a quota is full.
#include "facts/forecast.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "support.hpp"

namespace vornreport {
namespace {

using report_format::Forecast;
using report_format::ForecastState;
using report_format::Level;
using report_format::Sample;
using Samples = std::vector<Sample>;

constexpr std::int64_t kHour = 3600;
constexpr std::int64_t kDay = 24 * kHour;
constexpr std::int64_t kNow = 1767225600;  // 2026-01-01 00:00 UTC
constexpr std::uint64_t kGiB = std::uint64_t{1} << 30U;
constexpr std::uint64_t kSize = 1000 * kGiB;

// `at` gives what is used, in GiB, `days` ago; one sample every `step` days.
Samples series(int days, const std::function<double(int)>& at, int step = 1) {
  Samples samples;
  for (int ago = days; ago >= 0; ago -= step) {
    samples.push_back({kNow - ago * kDay, static_cast<std::uint64_t>(at(ago) * kGiB)});
  }
  return samples;
}

// GiB, `days` ago, after a growth of `gib` a day to `now`.
std::function<double(int)> growing(double gib, double now = 500) {
  return [=](int ago) { return now - gib * ago; };
}

// GiB by days ago.
Samples at(const std::vector<std::pair<int, double>>& points) {
  Samples samples;
  for (const auto& [ago, gib] : points) {
    samples.push_back({kNow - ago * kDay, static_cast<std::uint64_t>(gib * kGiB)});
  }
  return samples;
}

Samples without(const Samples& samples, std::size_t first, std::size_t last) {
  Samples left;
  for (std::size_t i = 0; i < samples.size(); ++i) {
    if (i < first || i >= last) {
      left.push_back(samples[i]);
    }
  }
  return left;
}

Samples later(Samples samples, std::size_t index, std::int64_t seconds) {
  samples.at(index).time += seconds;
  return samples;
}

Forecast told_of(const Samples& daily, std::uint64_t size = kSize) {
  const std::uint64_t used = daily.empty() ? 0 : daily.back().used;
  return forecast(daily, size, size - used);
}

// "growing 50 (40-60), 10 a day, 30, jump 100 at 3": days until full, GiB, the days that it rests
// on, GiB and days ago of a jump.
std::string text_of(const Forecast& told) {
  const auto gib = [](std::int64_t bytes) {
    return std::to_string(bytes / static_cast<std::int64_t>(kGiB));
  };
  std::string text = word_of(told.state);
  if (told.days && told.days_low && told.days_high) {
    text += " " + std::to_string(*told.days) + " (" + std::to_string(*told.days_low) + "-" +
            std::to_string(*told.days_high) + ")";
  }
  if (told.per_day) {
    text += ", " + gib(*told.per_day) + " a day";
  }
  text += ", " + std::to_string(told.window);
  if (told.jump) {
    text += ", jump " + gib(told.jump->bytes) + " at " +
            std::to_string((kNow - told.jump->date) / kDay);
  }
  EXPECT_EQ(told.days.has_value(), told.state == ForecastState::kGrowing) << text;
  EXPECT_EQ(told.days_low.has_value(), told.days.has_value()) << text;
  EXPECT_EQ(told.days_high.has_value(), told.days.has_value()) << text;
  return text;
}

struct Case {
  const char* what;
  Samples daily;
  const char* told;
  std::uint64_t size = 1000;  // GiB
};

void check(const std::vector<Case>& cases) {
  for (const Case& c : cases) {
    EXPECT_EQ(text_of(told_of(c.daily, c.size * kGiB)), c.told) << c.what;
  }
}

// --- Days ---------------------------------------------------------------------------------------

std::string text_of(const Samples& samples) {
  std::string text;
  for (const Sample& sample : samples) {
    text += std::to_string(sample.time) + ":" + std::to_string(sample.used) + " ";
  }
  return text;
}

TEST(DailySamples, TakeTheMedianOfEachLocalDay) {
  constexpr char kBerlin[] = "CET-1CEST,M3.5.0,M10.5.0/3";
  constexpr std::uint64_t kMost = ~std::uint64_t{0};
  const struct {
    const char* what;
    const char* zone;
    Samples samples;  // times after kNow
    Samples daily;
  } cases[] = {
      {"none", "UTC0", {}, {}},
      {"any order, odd and even numbers",
       "UTC0",
       {{kDay + 90, 7}, {30, 500}, {10, 9}, {kDay + 60, 4}, {20, 1}},
       {{20, 9}, {kDay + 75, 5}}},
      {"no overflow", "UTC0", {{0, kMost}, {1, kMost - 2}}, {{0, kMost - 1}}},
      {"midnight is the zone's",
       "CET-1",
       {{22 * kHour, 1}, {23 * kHour - 1, 1}, {23 * kHour, 2}},
       {{80999, 1}, {23 * kHour, 2}}},
      // 2026-03-29 begins 87 days later, an hour early, and has 23 hours.
      {"a day of 23 hours",
       kBerlin,
       {{87 * kDay - 3601, 1}, {87 * kDay - 3600, 2}, {88 * kDay - 7201, 4}, {88 * kDay - 7200, 5}},
       {{87 * kDay - 3601, 1}, {87 * kDay + 37799, 3}, {88 * kDay - 7200, 5}}},
      // 2026-10-25 begins 297 days later, two hours early, and has 25 hours.
      {"a day of 25 hours",
       kBerlin,
       {{297 * kDay - 7200, 2}, {298 * kDay - 3601, 4}, {298 * kDay - 3600, 5}},
       {{297 * kDay + 37799, 3}, {298 * kDay - 3600, 5}}},
  };
  for (const auto& c : cases) {
    Samples samples = c.samples, expected = c.daily;
    std::int64_t now = kNow;
    for (Sample& sample : samples) {
      sample.time += kNow;
      now = std::max(now, sample.time);
    }
    for (Sample& sample : expected) {
      sample.time += kNow;
    }
    EXPECT_TRUE(support::passes_in_zone(c.zone, [&] {
      EXPECT_EQ(text_of(daily_samples(samples, now)), text_of(expected)) << c.what;
    }));
  }
}

TEST(DailySamples, LeaveOutTheFutureAndWhatIsTooOld) {
  EXPECT_TRUE(support::passes_in_zone("UTC0", [] {
    EXPECT_EQ(text_of(daily_samples({{kNow + 1, 1}, {kNow, 2}}, kNow)), text_of({{kNow, 2}}));
    EXPECT_EQ(text_of(daily_samples({{kNow - 90 * kDay, 1}, {kNow - 90 * kDay - 1, 2}}, kNow)),
              text_of({{kNow - 90 * kDay, 1}}));
    // From 90 days ago to now are 91 calendar days.
    const Samples daily = daily_samples(series(120, growing(1)), kNow);
    ASSERT_EQ(daily.size(), 90U);
    EXPECT_EQ(daily.front().time, kNow - 89 * kDay);
    EXPECT_EQ(daily.back().time, kNow);
  }));
}

// --- States -------------------------------------------------------------------------------------

TEST(Forecast, KnowsTheBoundariesOfStates) {
  const Samples week = series(7, growing(10));
  // What grows by 1 GiB a day to `free` of `size`.
  const auto slow = [](int size, int free) { return series(30, growing(1, size - free)); };
  // Weekly samples with slopes of 1 to 7 GiB a day between their pairs, 80 of 5000 GiB free.
  const auto convex = [](int sign) {
    return series(
        28, [=](int ago) { return 4920 + sign * 7.0 * ((4 - ago / 7) * (4 - ago / 7) - 16); }, 7);
  };
  const std::vector<Case> cases = {
      {"one sample", series(0, growing(10)), "short, 0"},
      {"three samples in a week", without(week, 1, 6), "short, 7"},
      {"four samples in a week", without(week, 1, 5), "growing 50 (50-50), 10 a day, 7"},
      {"a second less than a week", later(week, 0, 1), "short, 6"},
      {"0.02 % of the size a day", slow(5000, 40), "growing 40 (40-40), 1 a day, 30", 5000},
      {"less than that", slow(5000, 40), "steady, 1 a day, 30", 5001},
      {"the smallest slope is 0.02 %", convex(1), "growing 20 (11-80), 4 a day, 28", 5000},
      {"less than that", convex(1), "steady, 4 a day, 28", 5001},
      {"the same down", convex(-1), "shrinking, -4 a day, 28", 5000},
      {"less than that", convex(-1), "steady, -4 a day, 28", 5001},
      {"shrinking", series(30, growing(-1)), "shrinking, -1 a day, 30", 5000},
      {"shrinking by less", series(30, growing(-1)), "steady, -1 a day, 30", 5001},
      {"3650 days", slow(4000, 3650), "growing 3650 (3650-3650), 1 a day, 30", 4000},
      {"more than that", slow(4000, 3651), "steady, 1 a day, 30", 4000},
      {"nothing free, whatever the samples", series(0, growing(0, 1000)), "full, 0"},
      {"no size", series(30, growing(0, 0)), "full, 0", 0},
  };
  check(cases);
}

// --- Trend --------------------------------------------------------------------------------------

TEST(Forecast, RestsOnPairsThatLieApart) {
  const std::vector<Case> cases = {
      // Slopes of 2, 5, 2.9 and 9.5 GiB a day; those between neighbours 6 days apart are 10 and -6.
      {"a week apart", at({{20, 400}, {14, 460}, {8, 424}, {0, 500}}),
       "growing 127 (52-250), 3 a day, 20"},
      {"a day apart below 14 days", at({{13, 400}, {9, 440}, {5, 432}, {0, 500}}),
       "steady, 7 a day, 13"},
      {"a week apart from 14 days on", at({{14, 399}, {9, 441}, {5, 432}, {0, 500}}),
       "growing 76 (69-137), 6 a day, 14"},
      {"weekly runs", at({{21, 300}, {14, 370}, {7, 328}, {0, 440}}), "steady, 5 a day, 21"},
      {"3 hours early", later(at({{21, 300}, {14, 370}, {7, 328}, {0, 440}}), 2, -3 * kHour),
       "steady, 5 a day, 21"},
      {"more than that", later(at({{21, 300}, {14, 370}, {7, 328}, {0, 441}}), 2, -3 * kHour - 1),
       "growing 83 (35-278), 6 a day, 21"},
      // Before, it grew by 15.5 GiB a day.
      {"the last 30 days",
       series(60, [](int ago) { return 700 - ago - 29.0 * std::max(ago - 30, 0) / 2; }),
       "growing 300 (300-300), 1 a day, 30"},
      {"all, where those have less than four samples", series(90, growing(5), 15),
       "growing 100 (100-100), 5 a day, 90"},
      {"all, where those have less than a week",
       at({{60, 200}, {50, 250}, {3, 485}, {2, 490}, {1, 495}, {0, 500}}),
       "growing 100 (100-100), 5 a day, 60"},
      // The slope between two days is the sum of their numbers. Percentiles of 28 slopes as of 7
      // figures: a tenth of the way, 3 and 11 of 1 to 13.
      {"percentiles", series(7, [](int ago) { return 923.0 + (7 - ago) * (7 - ago) - 49; }),
       "growing 11 (7-26), 7 a day, 7"},
      // By 3 % once a week.
      {"steps of a week", series(35, [](int ago) { return 879.0 - 30 * ((ago + 3) / 7); }),
       "growing 28 (24-35), 4 a day, 30"},
      {"a clean-up each week", series(60, [](int ago) { return 800.0 + 15 * ((70 - ago) % 7); }),
       "steady, 0 a day, 30"},
      {"a clean-up every 12 days",
       series(60, [](int ago) { return 700.0 + 15 * ((72 - ago) % 12); }), "steady, 0 a day, 30"},
      {"growth that stopped 20 days ago",
       series(60, [](int ago) { return 800.0 - 5 * std::max(ago - 20, 0); }),
       "steady, 1 a day, 30"},
  };
  check(cases);
}

TEST(Forecast, SurvivesOddNumbers) {
  constexpr std::uint64_t kMost = ~std::uint64_t{0};
  constexpr std::uint64_t kHalf = std::uint64_t{1} << 63U;
  const auto huge = [](std::uint64_t first, std::uint64_t step) {
    Samples samples;
    for (std::uint64_t i = 0; i <= 30; ++i) {
      samples.push_back({kNow - static_cast<std::int64_t>(30 - i) * kDay, first + step * i});
    }
    return samples;
  };
  // Sizes beyond what a signed number holds.
  Forecast told = told_of(huge(kMost - 40 * (kMost / 100), kMost / 100), kMost);
  EXPECT_EQ(told.state, ForecastState::kGrowing);
  EXPECT_EQ(told.days, 10);
  EXPECT_EQ(told.per_day.value_or(0) / 1024, static_cast<std::int64_t>(kMost / 100 / 1024));
  EXPECT_EQ(told_of(huge(kHalf, 0), kMost).state, ForecastState::kSteady);
  // A jump by all that there is, between samples an hour apart.
  Samples swing = huge(0, 0);
  swing.back() = {swing.end()[-2].time + kHour, kMost};
  told = forecast(swing, kMost, 1);
  ASSERT_TRUE(told.jump);
  EXPECT_EQ(told.jump->bytes, std::numeric_limits<std::int64_t>::max());
  // Two states in turn, both at the ends of what can be counted.
  for (std::size_t i = 0; i < swing.size(); i += 2) {
    swing[i].used = kMost;
  }
  EXPECT_EQ(forecast(swing, kMost, kMost).state, ForecastState::kSteady);
  // Times that stand still or go back.
  Samples still = series(30, growing(10));
  still[5].time = still[4].time;
  still[20].time = still[18].time - 1;
  EXPECT_EQ(told_of(still).state, ForecastState::kGrowing);
  for (Sample& sample : still) {
    sample.time = kNow;
  }
  EXPECT_EQ(text_of(told_of(still)), "short, 0");
  Samples twice = series(30, growing(0));
  twice.push_back({kNow, twice.back().used + 100 * kGiB});
  EXPECT_FALSE(told_of(twice).jump);
  // What is free of nothing: the smallest growth would fill it.
  told = forecast(series(30, growing(1)), 0, 1);
  EXPECT_EQ(told.days, 0);
  EXPECT_EQ(forecast(series(30, growing(0)), 0, 1).state, ForecastState::kSteady);
  told = forecast(at({{28, 0}, {21, 0.001}, {14, 10}, {7, 20}, {0, 30}}), 0, 3000 * kGiB);
  EXPECT_EQ(told.days_high, 36500);
  told = forecast(at({{28, 0}, {21, 0}, {14, 10}, {7, 20}, {0, 30}}), 0, 3000 * kGiB);
  EXPECT_EQ(told.state, ForecastState::kSteady);
}

// --- Jumps --------------------------------------------------------------------------------------

TEST(Forecast, TakesOutJumpsButNoRhythm) {
  // 500 GiB with changes: {days ago, GiB}. Between them it grows by `gib` a day.
  const auto with = [](std::vector<std::pair<int, double>> changes, double gib = 0) {
    return series(89, [=](int ago) {
      double used = 500 - gib * ago;
      for (const auto& [when, amount] : changes) {
        used += ago <= when ? amount : 0;
      }
      return used;
    });
  };
  const std::vector<Case> cases = {
      {"2 % of the size", with({{5, 20}}), "steady, 0 a day, 30"},
      {"more than that", with({{5, 21}}), "steady, 0 a day, 30, jump 21 at 5"},
      {"a fall", with({{5, -210}}), "steady, 0 a day, 30, jump -210 at 5"},
      {"8 times the usual change", with({{5, 77}}, 11), "growing 38 (26-39), 11 a day, 30"},
      {"more than that", with({{5, 78}}, 11), "growing 38 (38-39), 11 a day, 30, jump 89 at 5"},
      {"14 days ago", with({{14, 200}}, 4), "growing 75 (75-75), 4 a day, 30, jump 204 at 14"},
      {"15 days ago: taken out, not told", with({{15, 200}}, 4), "growing 75 (75-75), 4 a day, 30"},
      {"the newest", with({{10, 200}, {4, -100}}), "steady, 0 a day, 30, jump -100 at 4"},
      {"46 days apart", with({{50, 100}, {4, 100}}), "steady, 0 a day, 30, jump 100 at 4"},
      {"45 days apart", with({{49, 100}, {4, 100}}), "steady, 0 a day, 30"},
      {"two days in a row", with({{5, 100}, {4, 100}}), "steady, 0 a day, 30"},
      {"a clean-up between uploads of each week",
       with({{24, 51}, {17, 51}, {12, -200}, {10, 51}, {3, 51}}),
       "growing 68 (53-88), 7 a day, 30, jump -200 at 12"},
      {"8 times the usual change, up or down",
       series(60, [](int ago) { return 500 + 15 * (ago % 2) + (ago > 5 ? 0 : 100); }),
       "steady, 1 a day, 30"},
      {"by the day it is none", without(with({{1, 60}}, 10), 80, 88),
       "growing 44 (34-44), 10 a day, 30"},
      {"full by a jump", with({{2, 500}}), "full, 0, jump 500 at 2"},
      {"in a short history", at({{5, 100}, {4, 100}, {1, 300}, {0, 300}}),
       "short, 5, jump 200 at 1"},
      {"nothing else is known",
       at({{25, 100}, {24, 101}, {23, 102}, {22, 103}, {3, 300}, {2, 301}, {1, 302}, {0, 303}}),
       "steady, 0 a day, 25, jump 197 at 3"},
  };
  check(cases);
}

// --- Levels -------------------------------------------------------------------------------------

TEST(Forecast, PressesWhenBothSpaceAndTimeAreShort) {
  constexpr auto kGrowing = ForecastState::kGrowing;
  constexpr auto kSteady = ForecastState::kSteady;
  const struct {
    double percent;
    ForecastState state;
    std::int64_t days;
    Level volume, quota;
  } cases[] = {
      {59.9, kGrowing, 0, Level::kOk, Level::kOk},
      {60, kGrowing, 0, Level::kWarning, Level::kOk},
      {60, kGrowing, 60, Level::kWarning, Level::kOk},
      {84.9, kGrowing, 61, Level::kOk, Level::kOk},
      {69.9, kGrowing, 14, Level::kWarning, Level::kOk},
      {70, kGrowing, 14, Level::kCritical, Level::kWarning},
      {70, kGrowing, 15, Level::kWarning, Level::kOk},
      {84.9, kSteady, 0, Level::kOk, Level::kOk},
      {85, kSteady, 0, Level::kWarning, Level::kOk},
      {89.9, kSteady, 0, Level::kWarning, Level::kOk},
      {90, kSteady, 0, Level::kWarning, Level::kWarning},
      {94.9, kSteady, 0, Level::kWarning, Level::kWarning},
      {95, kSteady, 0, Level::kCritical, Level::kWarning},
      {100, ForecastState::kFull, 0, Level::kCritical, Level::kWarning},
      {100.1, kSteady, 0, Level::kCritical, Level::kCritical},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::to_string(c.percent) + " " + std::to_string(c.days));
    Forecast told;
    told.state = c.state;
    if (c.state == kGrowing) {
      told.days = c.days;
    }
    EXPECT_EQ(volume_level(c.percent, told), c.volume);
    EXPECT_EQ(quota_level(c.percent, &told), c.quota);
  }
  EXPECT_EQ(quota_level(89.9, nullptr), Level::kOk);
  EXPECT_EQ(quota_level(90, nullptr), Level::kWarning);
  EXPECT_EQ(quota_level(100.1, nullptr), Level::kCritical);
}

}  // namespace
}  // namespace vornreport
