#include "vorn/base/cron_times.hpp"

#include <strings.h>

#include <algorithm>
#include <charconv>
#include <span>
#include <stdexcept>
#include <utility>
#include <vector>

namespace host {

namespace {

struct Field {
  const char* name;
  unsigned low;
  unsigned high;
  std::span<const std::string_view> words;  // for `low` and what follows it
};

constexpr std::string_view kMonths[] = {"jan", "feb", "mar", "apr", "may", "jun",
                                        "jul", "aug", "sep", "oct", "nov", "dec"};
constexpr std::string_view kDays[] = {"sun", "mon", "tue", "wed", "thu", "fri", "sat"};

enum FieldIndex : std::size_t { kMinute, kHour, kDay, kMonth, kWeekday };
const std::array<Field, 5> kFields{{{"minute", 0, 59, {}},
                                    {"hour", 0, 23, {}},
                                    {"day of the month", 1, 31, {}},
                                    {"month", 1, 12, kMonths},
                                    {"day of the week", 0, 7, kDays}}};

constexpr std::pair<std::string_view, std::string_view> kNicknames[] = {{"@reboot", ""},
                                                                        {"@yearly", "0 0 1 1 *"},
                                                                        {"@annually", "0 0 1 1 *"},
                                                                        {"@monthly", "0 0 1 * *"},
                                                                        {"@weekly", "0 0 * * 0"},
                                                                        {"@daily", "0 0 * * *"},
                                                                        {"@midnight", "0 0 * * *"},
                                                                        {"@hourly", "0 * * * *"}};

bool same_word(std::string_view a, std::string_view b) {
  return a.size() == b.size() && strncasecmp(a.data(), b.data(), a.size()) == 0;
}

std::vector<std::string_view> split(std::string_view text, std::string_view separators,
                                    bool keep_empty) {
  std::vector<std::string_view> parts;
  for (std::size_t start = 0; start <= text.size();) {
    const std::size_t end = std::min(text.find_first_of(separators, start), text.size());
    if (keep_empty || end > start) {
      parts.push_back(text.substr(start, end - start));
    }
    start = end + 1;
  }
  return parts;
}

std::optional<unsigned> number(std::string_view text) {
  unsigned value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  return error == std::errc{} && end == text.data() + text.size() ? std::optional(value)
                                                                  : std::nullopt;
}

// Reads one field: a list of *, N and N-N, the first and the last with a step if wanted.
class FieldReader {
 public:
  FieldReader(const Field& field, std::string_view text) : field_(field), whole_(text) {}

  std::string read(CronTimes::Values& values) {
    std::string written;
    for (const std::string_view item : split(whole_, ",", true)) {
      written += written.empty() ? "" : ",";
      written += read_item(item, values);
    }
    return written;
  }

 private:
  std::string read_item(std::string_view item, CronTimes::Values& values) {
    const std::size_t slash = item.find('/');
    const std::string_view range = item.substr(0, slash);
    const std::size_t dash = range.find('-');
    const bool every = range == "*";
    unsigned low = field_.low;
    unsigned high = field_.high;
    std::string written = "*";
    if (!every) {
      low = value(range.substr(0, dash));
      high = dash == std::string_view::npos ? low : value(range.substr(dash + 1));
      written = std::to_string(low);
      written += dash == std::string_view::npos ? "" : "-" + std::to_string(high);
    }
    if (low > high) {
      wrong(range, "is a range that runs backwards; write it as two");
    }
    unsigned step = 1;
    if (slash != std::string_view::npos) {
      if (!every && dash == std::string_view::npos) {
        wrong(item, "has a step without a range; write */N or A-B/N");
      }
      const std::string_view text = item.substr(slash + 1);
      step = number(text).value_or(0);
      if (step < 1 || step > field_.high) {
        wrong(text, ("is no step from 1 to " + std::to_string(field_.high)).c_str());
      }
      written += "/" + std::to_string(step);
    }
    for (unsigned i = low; i <= high; i += step) {
      values.set(i);
    }
    return written;
  }

  unsigned value(std::string_view text) {
    for (std::size_t i = 0; i < field_.words.size(); ++i) {
      if (same_word(text, field_.words[i])) {
        return field_.low + static_cast<unsigned>(i);
      }
    }
    const std::optional<unsigned> found = number(text);
    if (!found || *found < field_.low || *found > field_.high) {
      std::string range = std::to_string(field_.low) + "-" + std::to_string(field_.high);
      if (!field_.words.empty()) {
        range.append(" or ").append(field_.words.front()).append("-").append(field_.words.back());
      }
      wrong(text, ("is not in " + range).c_str());
    }
    return *found;
  }

  [[noreturn]] void wrong(std::string_view part, const char* what) {
    throw std::runtime_error("the " + std::string(field_.name) + " \"" + std::string(whole_) +
                             "\" is wrong: \"" + std::string(part) + "\" " + what);
  }

  const Field& field_;
  std::string_view whole_;
};

}  // namespace

CronTimes::CronTimes(std::string_view text) {
  const auto words = split(text, " \t", false);
  if (words.size() == 1 && words[0].starts_with('@')) {
    for (const auto& [name, fields] : kNicknames) {
      if (same_word(words[0], name)) {
        read_fields(fields);
        text_ = name;
        return;
      }
    }
    throw std::runtime_error("\"" + std::string(words[0]) +
                             "\" is no time; write @hourly, @daily, @weekly, @monthly, @yearly, "
                             "@reboot or five fields");
  }
  if (words.size() != kFields.size()) {
    throw std::runtime_error("\"" + std::string(text) + "\" has " + std::to_string(words.size()) +
                             " fields; write five: minute, hour, day of the month, month, day of "
                             "the week");
  }
  read_fields(text);
  if (!next(std::time(nullptr))) {
    throw std::runtime_error("the day of the month \"" + std::string(words[kDay]) +
                             "\" never comes in the month \"" + std::string(words[kMonth]) + "\"");
  }
}

// Without fields (@reboot) no time is ever right.
void CronTimes::read_fields(std::string_view text) {
  const auto words = split(text, " \t", false);
  for (std::size_t i = 0; i < words.size(); ++i) {
    text_ += (i == 0 ? "" : " ") + FieldReader(kFields[i], words[i]).read(values_[i]);
  }
  if (values_[kWeekday].test(7)) {
    values_[kWeekday].set(0);  // both are Sunday
  }
  any_day_of_month_ = words.size() > kDay && words[kDay].starts_with('*');
  any_day_of_week_ = words.size() > kWeekday && words[kWeekday].starts_with('*');
}

namespace {

// "*" or "1,15", from `low` to `high`.
std::string listed(const CronTimes::Values& values, unsigned low, unsigned high) {
  std::string list;
  bool has_all = true;
  for (unsigned i = low; i <= high; ++i) {
    has_all = has_all && values.test(i);
    list += values.test(i) ? (list.empty() ? "" : ",") + std::to_string(i) : "";
  }
  return has_all ? "*" : list;
}

std::string listed_days_of_week(const CronTimes::Values& values) {
  std::string list;
  for (unsigned i = 0; i < std::size(kDays); ++i) {
    list += values.test(i) ? (list.empty() ? "" : ",") + std::string(kDays[i]) : "";
  }
  return list + " ";
}

}  // namespace

std::vector<std::string> CronTimes::calendar() const {
  if (values_[kMinute].none()) {
    return {};
  }
  const auto range = [&](FieldIndex field) {
    return listed(values_[field], kFields[field].low, kFields[field].high);
  };
  const std::string month = "*-" + range(kMonth) + "-";
  const std::string time = " " + range(kHour) + ":" + range(kMinute) + ":00";
  const bool every_weekday = listed(values_[kWeekday], 0, std::size(kDays) - 1) == "*";
  const std::string weekdays = every_weekday ? "" : listed_days_of_week(values_[kWeekday]);
  if (any_day_of_month_ || any_day_of_week_) {
    return {weekdays + month + range(kDay) + time};
  }
  return {weekdays + month + "*" + time, month + range(kDay) + time};
}

bool CronTimes::day_matches(const std::tm& day) const {
  const bool of_month = values_[kDay].test(static_cast<std::size_t>(day.tm_mday));
  const bool of_week = values_[kWeekday].test(static_cast<std::size_t>(day.tm_wday));
  return values_[kMonth].test(static_cast<std::size_t>(day.tm_mon) + 1) &&
         (any_day_of_month_ || any_day_of_week_ ? of_month && of_week : of_month || of_week);
}

std::optional<std::time_t> CronTimes::next(std::time_t now) const {
  constexpr int kDaysAhead = 366 * 9;  // around 2100, two 29ths of February are eight years apart
  constexpr int kNoon = 12;
  std::tm today{};
  localtime_r(&now, &today);
  for (int ahead = 0; ahead < kDaysAhead && values_[kMinute].any(); ++ahead) {
    std::tm day = today;
    day.tm_mday += ahead;
    day.tm_hour = kNoon;  // a time that every day has
    day.tm_isdst = -1;
    std::mktime(&day);
    for (int minute = day_matches(day) ? 0 : 24 * 60; minute < 24 * 60; ++minute) {
      if (!values_[kHour].test(static_cast<std::size_t>(minute / 60)) ||
          !values_[kMinute].test(static_cast<std::size_t>(minute % 60))) {
        continue;
      }
      std::tm time = day;
      time.tm_hour = minute / 60;
      time.tm_min = minute % 60;
      time.tm_sec = 0;
      time.tm_isdst = -1;
      if (const std::time_t found = std::mktime(&time); found > now) {
        return found;
      }
    }
  }
  return std::nullopt;
}

}  // namespace host
