// The time fields of a cron line, read as Debian's cron reads them.
#ifndef VORN_HOST_CRON_TIMES_HPP
#define VORN_HOST_CRON_TIMES_HPP

#include <array>
#include <bitset>
#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace host {

class CronTimes {
 public:
  using Values = std::bitset<60>;

  // `text` holds five fields (minute, hour, day of the month, month, day of the week) or one of
  // @reboot @yearly @annually @monthly @weekly @daily @midnight @hourly. Throws std::runtime_error
  // with a sentence that names the field that is wrong.
  explicit CronTimes(std::string_view text);

  // The fields as they go into a cron file: names of months and days as numbers, since cron takes
  // names neither in lists nor in ranges.
  const std::string& text() const { return text_; }

  // The same times as values of systemd's OnCalendar=, to be taken together. None for @reboot.
  std::vector<std::string> calendar() const;

  // The first time after `now`, in the time zone of this process. Nothing for @reboot.
  std::optional<std::time_t> next(std::time_t now) const;

 private:
  void read_fields(std::string_view text);
  bool day_matches(const std::tm& day) const;

  std::string text_;
  std::array<Values, 5> values_;
  // Whether the days of the month and of the week begin with '*': if not, either of them is enough.
  bool any_day_of_month_ = false;
  bool any_day_of_week_ = false;
};

}  // namespace host

#endif
