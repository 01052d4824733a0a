// How the finished reports of a profile are dated and ordered.
#include "run/old_reports.hpp"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>

#include "report_format/facts.hpp"
#include "support.hpp"

namespace {

constexpr const char* kWhole = "<!DOCTYPE html>\n</html>\n";

class OldReports : public testing::Test {
 protected:
  // Without `started` it has no facts.
  void add(const std::string& name, std::int64_t started = 0) const {
    support::write_file(folder.path(name) + "/report.html", kWhole);
    if (started > 0) {
      report_format::Facts facts;
      facts.started = started;
      support::write_file(folder.path(name) + "/report.json", to_line(facts));
    }
  }
  std::vector<std::string> names() const {
    std::vector<std::string> names;
    const auto reports = host::stored_reports(folder.path(), host::ReportSize::left_out);
    std::transform(reports->begin(), reports->end(), std::back_inserter(names),
                   [](const host::StoredReport& report) { return report.name; });
    return names;
  }
  // Whether the reports come in the order in which they are named here, on a server in `zone`.
  bool are_ordered(const char* zone, const std::vector<std::string>& expected) const {
    return support::passes_in_zone(zone, [&] { EXPECT_EQ(expected, names()); });
  }

  support::TempFolder folder;
};

TEST_F(OldReports, AreOrderedByTheirFactsWhateverTheZone) {
  add("2025-06-02_08-00-00", 1748818800);  // in Tokyo
  add("2025-06-01_17-00-00", 1748822400);  // an hour later, in Los Angeles
  add("2025-10-26_02-50-00", 1761439800);  // in Berlin, before the clock was set back
  add("2025-10-26_02-10-00", 1761441000);
  for (const char* number : {"-10", "", "-2"}) {  // of one second
    add(std::string("2025-12-01_00-00-00") + number, 1764547200);
  }
  const std::vector<std::string> in_order = {"2025-06-02_08-00-00",   "2025-06-01_17-00-00",
                                             "2025-10-26_02-50-00",   "2025-10-26_02-10-00",
                                             "2025-12-01_00-00-00",   "2025-12-01_00-00-00-2",
                                             "2025-12-01_00-00-00-10"};
  for (const char* zone : {"Asia/Tokyo", "America/Los_Angeles", "Europe/Berlin"}) {
    EXPECT_TRUE(are_ordered(zone, in_order)) << zone;
  }
  const auto reports = host::stored_reports(folder.path(), host::ReportSize::left_out);
  EXPECT_EQ(1748822400, reports->at(1).made);
}

TEST_F(OldReports, AreDatedByTheirNameWithoutFacts) {
  support::write_file(folder.path("elsewhere"), R"({"started": 1})");
  add("2025-01-05_00-00-00");
  add("2025-01-04_00-00-00");
  add("2025-01-03_00-00-00", 1735862400);  // as its name has it in UTC
  support::write_file(folder.path("2025-01-04_00-00-00/report.json"), R"({"started": "1"})");
  add("2025-01-02_00-00-00");
  std::filesystem::create_symlink(folder.path("elsewhere"),
                                  folder.path("2025-01-02_00-00-00/report.json"));
  add("2025-01-01_00-00-00");
  ASSERT_EQ(0, mkfifo(folder.path("2025-01-01_00-00-00/report.json").c_str(), 0600));
  add("2024-09-08_00-30-00");  // an hour that Chile leaves out
  const std::vector<std::string> in_order = {"2024-09-08_00-30-00", "2025-01-01_00-00-00",
                                             "2025-01-02_00-00-00", "2025-01-03_00-00-00",
                                             "2025-01-04_00-00-00", "2025-01-05_00-00-00"};
  EXPECT_TRUE(are_ordered("UTC", in_order));
  EXPECT_TRUE(are_ordered("America/Santiago", in_order));
}

TEST_F(OldReports, OfAClockThatWasAheadAreNotTheNewest) {
  const std::int64_t now = std::time(nullptr);
  add("2099-01-01_00-00-00", 4070908800);
  add("2098-01-01_00-00-00");
  add("2025-01-01_00-00-00", 1735689600);
  add("2025-01-02_00-00-00", now + 3600);  // a clock that is a little late now
  EXPECT_EQ((std::vector<std::string>{"2098-01-01_00-00-00", "2099-01-01_00-00-00",
                                      "2025-01-01_00-00-00", "2025-01-02_00-00-00"}),
            names());
  host::remove_old_reports(folder.path(), 2, "2025-01-01_00-00-00");
  EXPECT_EQ((std::vector<std::string>{"2025-01-01_00-00-00", "2025-01-02_00-00-00"}), names());
}

}  // namespace
