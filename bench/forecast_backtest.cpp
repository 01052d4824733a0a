// Measures the forecast against truth on generated series, and prints tables in Markdown.
//
//     forecast_backtest [SERIES]
//
// SERIES are made of each kind (default: 10000), always the same ones.
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <functional>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "facts/forecast.hpp"

namespace {

using report_format::Forecast;
using report_format::ForecastState;
using report_format::Sample;

constexpr double kSize = 1e13;
constexpr std::int64_t kNow = 1767232800;  // 2026-01-01 02:00 UTC
constexpr double kAhead = 90;
constexpr double kHistory = 90;
constexpr double kMostUsed = 98;  // per cent; a saw-tooth never gets beyond

// --- Numbers ------------------------------------------------------------------------------------

// The same everywhere: the distributions of the standard library differ between its makers.
class Random {
 public:
  double between(double low, double high) {
    constexpr double kSteps = 0x1p64;
    return low + (high - low) * (static_cast<double>(engine_()) / kSteps);
  }
  // Every size as likely as its double.
  double scaled(double low, double high) {
    return std::exp(between(std::log(low), std::log(high)));
  }
  // Of variance 1.
  double normal() {
    constexpr double kTwoPi = 6.283185307179586;
    return std::sqrt(-2 * std::log(1 - between(0, 1))) * std::cos(kTwoPi * between(0, 1));
  }

 private:
  std::mt19937_64 engine_{20260101};
};

// --- Kinds --------------------------------------------------------------------------------------

// Per cent of the size, `day` days from now (before: negative), but for a constant.
using Shape = std::function<double(double day)>;

// What a kind's forecasts should be.
enum class Aim : std::uint8_t {
  kHeld,      // the interval holds the true time for 80 % of those that fill up
  kFlat,      // less than 1 % are growing
  kSteady,    // 95 % are steady
  kAnything,  // what they are is worth knowing
};

struct Kind {
  const char* name;
  Aim aim;
  Shape (*make)(Random& random);
};

double since(double day, double period) {
  const double rest = std::fmod(day, period);
  return rest < 0 ? rest + period : rest;
}

double pace(Random& random) {
  return random.scaled(0.05, 2);
}

// Up on five days, back on two.
Shape week(Random& random) {
  const double begin = random.between(0, 7), swing = random.between(1, 4);
  return [=](double day) {
    const double weekday = since(day + begin, 7);
    return swing * (weekday < 5 ? weekday / 5 : (7 - weekday) / 2);
  };
}

Shape step(Random& random) {
  const double ago = random.between(1, 29), height = random.between(5, 30);
  return [=](double day) { return day >= -ago ? height : 0; };
}

Shape with_growth(const Shape& shape, Random& random) {
  return [shape, pace = pace(random)](double day) { return shape(day) + pace * day; };
}

Shape stopped(double ago, Random& random) {
  return [ago, pace = pace(random)](double day) { return pace * std::min(day, -ago); };
}

Shape saw(double shortest, double longest, Random& random) {
  const double period = random.between(shortest, longest), height = random.between(5, 30);
  const double begin = random.between(0, period);
  return [=](double day) { return height * since(day + begin, period) / period; };
}

constexpr Kind kKinds[] = {
    {"steady growth", Aim::kHeld,
     [](Random& random) { return with_growth([](double /*day*/) { return 0; }, random); }},
    {"+3 % once a week", Aim::kHeld,
     [](Random& random) -> Shape {
       const double begin = random.between(0, 7);
       return [begin](double day) { return 3 * std::floor((day + begin) / 7); };
     }},
    {"weekly rhythm and growth", Aim::kHeld,
     [](Random& random) { return with_growth(week(random), random); }},
    {"one jump and growth", Aim::kHeld,
     [](Random& random) { return with_growth(step(random), random); }},
    {"flat", Aim::kFlat, [](Random& /*random*/) -> Shape { return [](double) { return 0; }; }},
    {"weekly rhythm", Aim::kFlat, [](Random& random) { return week(random); }},
    {"plateau of 31 to 80 days", Aim::kFlat,
     [](Random& random) { return stopped(random.between(31, 80), random); }},
    {"one jump", Aim::kAnything, [](Random& random) { return step(random); }},
    {"saw-tooth of 3 to 10 days", Aim::kSteady, [](Random& random) { return saw(3, 10, random); }},
    {"saw-tooth of 10 to 20 days", Aim::kSteady,
     [](Random& random) { return saw(10, 20, random); }},
    {"saw-tooth of 20 to 30 days", Aim::kSteady,
     [](Random& random) { return saw(20, 30, random); }},
    {"growth that stopped 20 days ago", Aim::kAnything,
     [](Random& random) { return stopped(20, random); }},
    {"growth that stopped 10 days ago", Aim::kAnything,
     [](Random& random) { return stopped(10, random); }},
};

// --- Series -------------------------------------------------------------------------------------

struct Ages {
  double shortest, longest;  // days of history
};

// A volume's true course in per cent: it was never empty in its history of `age` days, and not full
// up to now.
Shape course(const Kind& kind, double age, Random& random) {
  for (;;) {
    const Shape shape = kind.make(random);
    const double shift = random.between(40, 95) - shape(0);
    bool fits = true;
    for (int quarter = 0; quarter <= 4 * static_cast<int>(kHistory) && fits; ++quarter) {
      const double ago = quarter / 4.0;
      const double percent = shape(-ago) + shift;
      fits = percent < kMostUsed && (percent > 0 || ago > age);
    }
    if (fits) {
      return [shape, shift](double day) { return shape(day) + shift; };
    }
  }
}

// Days from now, to the hour.
std::optional<double> full_within(const Shape& course, double days) {
  for (int hour = 0; hour <= static_cast<int>(days * 24); ++hour) {
    if (course(hour / 24.0) >= 100) {
      return hour / 24.0;
    }
  }
  return {};
}

// What runs of a schedule every `every` days have stored, each up to half an hour late.
std::vector<Sample> sampled(const Shape& course, int every, double age, Random& random) {
  const double noise = random.between(0.2, 1);
  std::vector<Sample> samples;
  for (int day = 0; day <= age; day += every) {
    const double late = random.between(0, 1.0 / 48);
    const double percent = course(late - day) + noise * random.normal();
    samples.push_back({kNow + std::llround((late - day) * 86400),
                       static_cast<std::uint64_t>(std::clamp(percent, 0.0, 100.0) / 100 * kSize)});
  }
  return samples;
}

Forecast forecast_of(const std::vector<Sample>& samples) {
  const std::vector<Sample> daily = vornreport::daily_samples(samples, samples.front().time);
  constexpr auto kBytes = static_cast<std::uint64_t>(kSize);
  return vornreport::forecast(daily, kBytes, kBytes - samples.front().used);
}

// --- Tables -------------------------------------------------------------------------------------

struct Row {
  int series = 0;
  int states[5] = {};
  int fill = 0;                 // within kAhead days
  int told = 0;                 // of these, those that are told as growing
  int held = 0;                 // of these, those whose interval holds the true time
  std::vector<double> spreads;  // of those told, days_high / days_low

  static double percent(int part, int whole) { return whole == 0 ? 0 : 100.0 * part / whole; }
  double state(ForecastState which) const {
    return percent(states[static_cast<std::size_t>(which)], series);
  }
  bool reaches(Aim aim) const {
    constexpr double kLeastHeld = 80, kMostGrowing = 1, kLeastSteady = 95;
    switch (aim) {
      case Aim::kHeld:
        return percent(held, fill) >= kLeastHeld;
      case Aim::kFlat:
        return state(ForecastState::kGrowing) < kMostGrowing;
      case Aim::kSteady:
        return state(ForecastState::kSteady) >= kLeastSteady;
      case Aim::kAnything:
        break;
    }
    return true;
  }
};

void add(Row& row, const Forecast& told, const std::optional<double>& full) {
  ++row.series;
  ++row.states[static_cast<std::size_t>(told.state)];
  row.fill += full ? 1 : 0;
  if (!full || !told.days_low || !told.days_high) {
    return;
  }
  const auto low = static_cast<double>(*told.days_low), high = static_cast<double>(*told.days_high);
  ++row.told;
  row.held += low <= *full && *full <= high ? 1 : 0;
  row.spreads.push_back(high / std::max(low, 1.0));
}

Row measured(const Kind& kind, int every, Ages ages, long count) {
  Random random;
  Row row;
  for (long i = 0; i < count; ++i) {
    const double age = random.between(std::max<double>(ages.shortest, 3 * every), ages.longest);
    const Shape shape = course(kind, age, random);
    add(row, forecast_of(sampled(shape, every, age, random)), full_within(shape, kAhead));
  }
  return row;
}

const char* word_of(int every) {
  return every == 1 ? "daily" : "weekly";
}

void print(const Kind& kind, int every, Row& row) {
  std::printf("| %s | %s |", kind.name, word_of(every));
  for (const auto state : {ForecastState::kGrowing, ForecastState::kShrinking,
                           ForecastState::kSteady, ForecastState::kShort}) {
    std::printf(" %.1f |", row.state(state));
  }
  if (row.fill == 0) {
    std::printf(" | | | |\n");
    return;
  }
  std::sort(row.spreads.begin(), row.spreads.end());
  std::printf(" %d | %.1f | %.1f | %.1f |\n", row.fill, Row::percent(row.told, row.fill),
              Row::percent(row.held, row.fill),
              row.spreads.empty() ? 0 : row.spreads[row.spreads.size() / 2]);
}

void print_table(Ages ages, long count) {
  std::printf("%.0f to %.0f days of history:\n\n", ages.shortest, ages.longest);
  std::printf(
      "| kind | samples | growing | shrinking | steady | short | fill up | told | held | spread |\n"
      "|---|---|---|---|---|---|---|---|---|---|\n");
  std::string missed;
  for (const Kind& kind : kKinds) {
    for (const int every : {1, 7}) {
      Row row = measured(kind, every, ages, count);
      print(kind, every, row);
      if (!row.reaches(kind.aim)) {
        missed += std::string(missed.empty() ? "" : "; ") + kind.name + ", " + word_of(every);
      }
    }
  }
  std::printf("\nAims missed: %s.\n", missed.empty() ? "none" : missed.c_str());
}

}  // namespace

int main(int argc, char** argv) {
  constexpr int kMost = 1000000;
  const long count = argc > 1 ? std::strtol(argv[1], nullptr, 10) : 10000;
  if (count <= 0 || count > kMost || argc > 2) {
    std::fprintf(stderr, "usage: forecast_backtest [SERIES]\n");
    return 2;
  }
  setenv("TZ", "UTC0", 1);
  tzset();
  print_table({30, kHistory}, count);
  std::printf("\n");
  print_table({7, 30}, count);
  return 0;
}
