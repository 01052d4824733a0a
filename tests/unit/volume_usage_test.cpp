// Volume usage: the estimate, the chains, the writers; the history is a real database.
#include <sys/stat.h>

#include "rep_volume_usage.hpp"
#include "report_fixture.hpp"
#include "vorn/paths.h"

namespace vornreport {
namespace {

class VolumeUsageTest : public ReportTest {
 protected:
  VolumeUsageTest() {
    support::write_file(VORN_PATH_HISTORY_SCHEMA,
                        support::read_file(VORN_TEST_SOURCE_DIR "/sql/vornreport.sql"));
    unlink(VORN_PATH_HISTORY_DB);
    mkdir("/usr/vorn/etc", 0755);
  }
  ~VolumeUsageTest() override {
    QAZLLfree(&list_, VolumeUsageFreeNode);
    unlink(VORN_PATH_HISTORY_DB);
  }

  static VolumeUsageSample* sample(const char* date, const char* used, const char* free,
                                   VolumeUsageSample* next = nullptr) {
    auto* made = new VolumeUsageSample{};
    made->sampleDate.format("%s", date);
    made->sizeUse.format("%s", used);
    made->sizeFree.format("%s", free);
    made->percent.format("50.0000");
    made->next = next;
    return made;
  }
  void add_volume(const char* name, VolumeUsageSample* samples, int32_t days = 0) {
    auto* node = new VolumeUsageNode{};
    node->name.format("%s", name);
    node->samples = samples;
    node->days = days;
    ASSERT_EQ(QAZLLadd(&list_, node, nullptr), 0);
  }

  QAZLLNode* list_ = nullptr;
};

TEST_F(VolumeUsageTest, EstimatesTheDaysUntilFull) {
  const struct {
    const char* what;
    const char* now[3];  // date, used, free
    const char* then[2];
    const char* before[2];  // older; null: none
    int32_t days;
  } cases[] = {
      {"grew by 1000 a second", {"2000", "1001000", "864000000"}, {"1000", "1000"}, {}, 10},
      {"fell", {"2000", "10", "864000000"}, {"1000", "1000"}, {}, 0},
      {"level", {"2000", "10", "864000000"}, {"1000", "10"}, {}, 0},
      {"same second", {"2000", "999", "999"}, {"2000", "1"}, {}, 0},
      {"same second, then older",
       {"2000", "1001000", "86400000"},
       {"2000", "1"},
       {"1000", "1000"},
       1},
      {"below a byte a second", {"2000", "1500", "999999"}, {"1000", "1000"}, {}, 0},
      {"newest lower one counts",
       {"3000", "2001000", "86400000"},
       {"2000", "1000"},
       {"1000", "0"},
       0},
      {"clock set back", {"1000", "1001000", "864000000"}, {"2000", "1000"}, {}, 0},
      {"full", {"2000", "1001000", "0"}, {"1000", "1000"}, {}, 0},
      {"more days than 31 bits hold",
       {"2000", "2000", "18446744073709551615"},
       {"1000", "1000"},
       {},
       static_cast<int32_t>(18446744073709551615ULL / 86400)},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    VolumeUsageSample* older =
        c.before[0] != nullptr ? sample(c.before[0], c.before[1], "0") : nullptr;
    add_volume("/v",
               sample(c.now[0], c.now[1], c.now[2], sample(c.then[0], c.then[1], "0", older)));
    printed([&] { VolumeUsageEstimateDays(list_); });
    EXPECT_EQ(volume_of(list_)->days, c.days);
    QAZLLfree(&list_, VolumeUsageFreeNode);
  }
}

TEST_F(VolumeUsageTest, HistoryIsChainedNewestFirstAndNamesNoLostVolume) {
  printed([] {
    for (const char* date : {"1000", "1100"}) {
      for (const char* volume : {"/v", "/gone"}) {
        EXPECT_EQ(VornQazDBVolumeUsageInsert("global", volume, "5", "6", "45.4545", date), 0);
      }
    }
  });
  printed([&] { VornQazDBVolumeUsageInsert("p1", "/v", "5", "6", "45", "1050"); });
  add_volume("/v", sample("1200", "9", "2"));
  const std::string output =
      printed([&] { EXPECT_EQ(VornQazDBVolumeUsageSelect("p1", &list_), 0); });
  const VolumeUsageSample* chain = volume_of(list_)->samples;
  EXPECT_STREQ(chain->sampleDate.c_str(), "1200");
  EXPECT_STREQ(chain->next->sampleDate.c_str(), "1100");
  EXPECT_STREQ(chain->next->next->sampleDate.c_str(), "1000");
  EXPECT_EQ(chain->next->next->next, nullptr);
  const QAZLLNode* lost = list_->next;
  ASSERT_NE(lost, nullptr);
  EXPECT_TRUE(volume_of(lost)->name.empty());
  EXPECT_EQ(volume_of(lost)->days, -1);
  ASSERT_NE(lost->next, nullptr);
  EXPECT_EQ(lost->next->next, nullptr);
  EXPECT_NE(output.find("===========>fetch row i=3, volume="), std::string::npos);
}

TEST_F(VolumeUsageTest, CollectingStoresOneDateForAllVolumes) {
  platform.mounted = {{"/srv/with a rather long mount path", 25, 100}, {"/b", 0, 0}};
  printed([&] { EXPECT_EQ(volume_usage_collect_data("p1", profile_.get()), 0); });
  sqlite3* raw = nullptr;
  ASSERT_EQ(sqlite3_open(VORN_PATH_HISTORY_DB, &raw), SQLITE_OK);
  const SqliteHandle db(raw);
  std::string rows;
  sqlite3_exec(
      raw,
      "select profile||'|'||volume||'|'||sizeUse||'|'||sizeFree||'|'||percent||'|'||sampleDate "
      "from VolumeUsage order by rowid",
      [](void* out, int, char** values, char**) {
        static_cast<std::string*>(out)->append(values[0]).append("\n");
        return 0;
      },
      &rows, nullptr);
  EXPECT_EQ(rows,
            "p1|/srv/with a rather long mount p|75|25|75.0000|1700000000\n"
            "p1|/b|0|0|-nan|1700000000\n");
  platform.mounted.clear();
  printed([&] { EXPECT_EQ(volume_usage_collect_data("p1", profile_.get()), -1); });
  const std::string log = support::syslog_text();
  EXPECT_NE(log.find("no mounted volume\n"), std::string::npos);
  EXPECT_NE(log.find("volume usage get data failed, profile=p1\n"), std::string::npos);
}

}  // namespace
}  // namespace vornreport
