// The times of cron's fields as systemd's calendar has them.
#include "vorn/base/cron_times.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <memory>

namespace {

// The first time after `base` by systemd itself; the earliest of several calendars.
std::time_t next_by_systemd(const std::vector<std::string>& calendar, std::time_t base) {
  std::time_t first = 0;
  for (const std::string& value : calendar) {
    const std::string command = "date +%s -ud \"$(systemd-analyze calendar --base-time=@" +
                                std::to_string(base) + " '" + value +
                                "' | sed -n 's/^ *Next elapse: //p')\"";
    const auto close = [](FILE* pipe) { pclose(pipe); };
    const std::unique_ptr<FILE, decltype(close)> pipe(popen(command.c_str(), "r"));
    char text[32] = "";
    EXPECT_NE(nullptr, std::fgets(text, sizeof text, pipe.get())) << command;
    const std::time_t next = std::atoll(text);
    first = first == 0 ? next : std::min(first, next);
  }
  return first;
}

TEST(CronTimes, MeanTheSameToSystemd) {
  setenv("TZ", "UTC", 1);
  tzset();
  constexpr std::time_t kBase = 1'763'463'600;
  for (const char* times : {"0 4 * * 1", "*/20 0-6/2 1,15 1-3 *", "5 4 * * 7", "0 4 13 * fri",
                            "0 4 */2 * fri", "0 4 29 feb *", "59 23 31 12 *", "15-45/30 4,16 1 1 *",
                            "@hourly", "@weekly", "@yearly", "* * * * *", "0 4 * * mon-fri"}) {
    const host::CronTimes cron(times);
    std::time_t at = kBase;
    for (int i = 0; i < 3; ++i) {
      const auto next = cron.next(at);
      ASSERT_TRUE(next) << times;
      EXPECT_EQ(*next, next_by_systemd(cron.calendar(), at)) << times;
      at = *next;
    }
  }
  EXPECT_TRUE(host::CronTimes("@reboot").calendar().empty());
  unsetenv("TZ");
}

}  // namespace
