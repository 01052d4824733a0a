#include "facts/forecast.hpp"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <ctime>
#include <limits>
#include <numeric>
#include <utility>

#include "report_format/values.hpp"

namespace vornreport {
namespace {

using report_format::Forecast;
using report_format::ForecastState;
using report_format::Jump;
using report_format::Level;
using report_format::Sample;

constexpr std::int64_t kDay = 86400;
constexpr std::int64_t kHour = 3600;

constexpr std::int64_t kHistory = 90 * kDay;
constexpr std::size_t kMostDays = 90;

// Less than this is no trend.
constexpr std::size_t kLeastSamples = 4;
constexpr std::int64_t kLeastSpan = 7 * kDay;

constexpr double kJumpShare = 0.02;  // of the size
constexpr double kJumpTimes = 8;     // the median change of a day
constexpr std::int64_t kJumpAlone = 45 * kDay;
constexpr std::int64_t kJumpTold = 14 * kDay;

constexpr std::int64_t kTrendSpan = 30 * kDay;
constexpr std::int64_t kShortTrend = 14 * kDay;
constexpr std::int64_t kPairsApart = 7 * kDay;
constexpr std::int64_t kPairsApartShort = kDay;
constexpr std::int64_t kPairsSlack = 3 * kHour;

constexpr double kOuterPercentile = 0.2;  // and 0.8
constexpr double kLeastShare = 0.0002;    // of the size a day
constexpr double kMostDaysAhead = 3650;
constexpr double kMostDaysHigh = 36500;

// --- Days ---------------------------------------------------------------------------------------

// Calendar day in the process's time zone.
std::pair<int, int> local_day(std::int64_t time) {
  const std::time_t seconds = time;
  std::tm local{};
  localtime_r(&seconds, &local);
  return {local.tm_year, local.tm_yday};
}

// `values` are sorted and not empty.
template <typename Value>
Value middle(const std::vector<Value>& values) {
  const std::size_t half = values.size() / 2;
  return values.size() % 2 != 0 ? values[half] : std::midpoint(values[half - 1], values[half]);
}

// `day` is sorted by time and not empty.
Sample median_of(std::span<const Sample> day) {
  std::vector<std::int64_t> times;
  std::vector<std::uint64_t> used;
  for (const Sample& sample : day) {
    times.push_back(sample.time);
    used.push_back(sample.used);
  }
  std::sort(used.begin(), used.end());
  return {middle(times), middle(used)};
}

// --- Jumps --------------------------------------------------------------------------------------

// Between two neighbouring samples.
struct Change {
  std::int64_t date = 0;  // of the later one
  std::int64_t bytes = 0;
  double per_day = 0;
};

double days_between(const Sample& earlier, const Sample& later) {
  return static_cast<double>(later.time - earlier.time) / static_cast<double>(kDay);
}

// Exact up to 2^63, and no more than that beyond.
std::int64_t bytes_between(const Sample& earlier, const Sample& later) {
  const bool fell = later.used < earlier.used;
  const std::uint64_t distance = fell ? earlier.used - later.used : later.used - earlier.used;
  const auto bytes = static_cast<std::int64_t>(
      std::min<std::uint64_t>(distance, std::numeric_limits<std::int64_t>::max()));
  return fell ? -bytes : bytes;
}

std::vector<Change> changes_of(std::span<const Sample> daily) {
  std::vector<Change> changes;
  for (std::size_t i = 1; i < daily.size(); ++i) {
    const double days = days_between(daily[i - 1], daily[i]);
    if (days > 0) {
      const std::int64_t bytes = bytes_between(daily[i - 1], daily[i]);
      changes.push_back({daily[i].time, bytes, static_cast<double>(bytes) / days});
    }
  }
  return changes;
}

double median_change(const std::vector<Change>& changes) {
  std::vector<double> amounts;
  amounts.reserve(changes.size());
  for (const Change& change : changes) {
    amounts.push_back(std::abs(change.per_day));
  }
  std::sort(amounts.begin(), amounts.end());
  return amounts.empty() ? 0 : middle(amounts);
}

// Oldest first.
std::vector<Jump> jumps_of(std::span<const Sample> daily, std::uint64_t size) {
  std::vector<Change> great = changes_of(daily);
  const double least_per_day = kJumpTimes * median_change(great);
  const double least = kJumpShare * static_cast<double>(size);
  std::erase_if(great, [&](const Change& change) {
    return std::abs(static_cast<double>(change.bytes)) <= least ||
           std::abs(change.per_day) <= least_per_day;
  });
  std::vector<Jump> jumps;
  for (const Change& change : great) {
    const auto near = std::count_if(great.begin(), great.end(), [&](const Change& other) {
      return (other.bytes < 0) == (change.bytes < 0) &&
             std::abs(other.date - change.date) <= kJumpAlone;
    });
    if (near == 1) {  // itself
      jumps.push_back({change.date, change.bytes});
    }
  }
  return jumps;
}

// --- Trend --------------------------------------------------------------------------------------

std::int64_t span_of(std::span<const Sample> daily) {
  return daily.empty() ? 0 : daily.back().time - daily.front().time;
}

bool is_short(std::span<const Sample> daily) {
  return daily.size() < kLeastSamples || span_of(daily) < kLeastSpan;
}

// What of `daily` the trend rests on.
std::span<const Sample> recent(std::span<const Sample> daily) {
  const std::int64_t since = daily.back().time - kTrendSpan;
  const auto first = std::find_if(daily.begin(), daily.end(),
                                  [since](const Sample& sample) { return sample.time >= since; });
  const std::span<const Sample> last_days(first, daily.end());
  return is_short(last_days) ? daily : last_days;
}

// In bytes a day, sorted.
std::vector<double> slopes_of(std::span<const Sample> samples, const std::vector<Jump>& jumps) {
  const std::int64_t apart =
      (span_of(samples) < kShortTrend ? kPairsApartShort : kPairsApart) - kPairsSlack;
  const auto jumps_until = [&jumps](const Sample& sample) {
    return std::count_if(jumps.begin(), jumps.end(),
                         [&sample](const Jump& jump) { return jump.date <= sample.time; });
  };
  std::vector<double> slopes;
  for (std::size_t i = 0; i < samples.size(); ++i) {
    const auto jumps_before = jumps_until(samples[i]);
    for (std::size_t j = i + 1; j < samples.size(); ++j) {
      if (samples[j].time - samples[i].time >= apart && jumps_until(samples[j]) == jumps_before) {
        slopes.push_back(static_cast<double>(bytes_between(samples[i], samples[j])) /
                         days_between(samples[i], samples[j]));
      }
    }
  }
  std::sort(slopes.begin(), slopes.end());
  return slopes;
}

// What lies `share` of the way from the first to the last of `sorted`, which is not empty.
double value_at(const std::vector<double>& sorted, double share) {
  const double position = share * static_cast<double>(sorted.size() - 1);
  const auto below = static_cast<std::size_t>(position);
  const std::size_t above = std::min(below + 1, sorted.size() - 1);
  return std::lerp(sorted[below], sorted[above], position - static_cast<double>(below));
}

// Bytes a day.
struct Trend {
  double low = 0, median = 0, high = 0;
};

Trend trend_of(std::span<const Sample> samples, const std::vector<Jump>& jumps) {
  const std::vector<double> slopes = slopes_of(samples, jumps);
  if (slopes.empty()) {
    return {};
  }
  const auto count = static_cast<double>(samples.size());  // kLeastSamples or more
  const double outer = std::max(0.0, (kOuterPercentile * count - 1) / (count - 2));
  return {value_at(slopes, outer), value_at(slopes, 0.5), value_at(slopes, 1 - outer)};
}

void judge(const Trend& trend, std::uint64_t size, std::uint64_t free, Forecast& told) {
  const double least = kLeastShare * static_cast<double>(size);
  const auto room = static_cast<double>(free);
  // At least a day lies between most pairs, and so the median is less than 2^63.
  told.per_day = std::llround(trend.median);
  told.state = ForecastState::kSteady;
  if (trend.high < 0 && trend.high <= -least) {
    told.state = ForecastState::kShrinking;
  } else if (trend.low > 0 && trend.low >= least &&
             std::floor(room / trend.median) <= kMostDaysAhead) {
    told.state = ForecastState::kGrowing;
    told.days = static_cast<std::int64_t>(room / trend.median);
    told.days_low = static_cast<std::int64_t>(room / trend.high);
    told.days_high =
        static_cast<std::int64_t>(std::min(std::ceil(room / trend.low), kMostDaysHigh));
  }
}

// --- Levels -------------------------------------------------------------------------------------

// From `percent` used on, a volume that is full in `days` or sooner has the level; from `alone` on
// any has.
struct LevelRule {
  double alone;
  std::int64_t days;
  double percent;
};
constexpr LevelRule kVolumeCritical{95, 14, 70};
constexpr LevelRule kVolumeWarning{85, 60, 60};
constexpr LevelRule kQuotaWarning{report_format::kNearQuota, 14, 70};

bool holds(const LevelRule& rule, double percent, const Forecast* told) {
  const bool fills = told != nullptr && told->days && *told->days <= rule.days;
  return percent >= rule.alone || (fills && percent >= rule.percent);
}

}  // namespace

std::vector<Sample> daily_samples(std::vector<Sample> samples, std::int64_t now) {
  std::erase_if(samples, [now](const Sample& sample) {
    return sample.time > now || sample.time < now - kHistory;
  });
  std::sort(samples.begin(), samples.end(),
            [](const Sample& one, const Sample& two) { return one.time < two.time; });
  std::vector<Sample> daily;
  for (auto first = samples.begin(); first != samples.end();) {
    const auto day = local_day(first->time);
    const auto next = std::find_if(first, samples.end(), [&day](const Sample& sample) {
      return local_day(sample.time) != day;
    });
    daily.push_back(median_of({first, next}));
    first = next;
  }
  // 90 times 24 hours can reach into 91 days.
  if (daily.size() > kMostDays) {
    daily.erase(daily.begin(), daily.end() - kMostDays);
  }
  return daily;
}

Forecast forecast(std::span<const Sample> daily, std::uint64_t size, std::uint64_t free) {
  Forecast told;
  const std::vector<Jump> jumps = jumps_of(daily, size);
  if (!jumps.empty() && daily.back().time - jumps.back().date <= kJumpTold) {
    told.jump = jumps.back();
  }
  if (free == 0) {
    told.state = ForecastState::kFull;
  } else if (is_short(daily)) {
    told.state = ForecastState::kShort;
    told.window = span_of(daily) / kDay;
  } else {
    const std::span<const Sample> samples = recent(daily);
    told.window = (span_of(samples) + kDay / 2) / kDay;
    judge(trend_of(samples, jumps), size, free, told);
  }
  return told;
}

Level volume_level(double percent, const Forecast& forecast) {
  if (holds(kVolumeCritical, percent, &forecast)) {
    return Level::kCritical;
  }
  return holds(kVolumeWarning, percent, &forecast) ? Level::kWarning : Level::kOk;
}

Level quota_level(double percent, const Forecast* forecast) {
  if (percent > report_format::kOverQuota) {
    return Level::kCritical;
  }
  return holds(kQuotaWarning, percent, forecast) ? Level::kWarning : Level::kOk;
}

}  // namespace vornreport
