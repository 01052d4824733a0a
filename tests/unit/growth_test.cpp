// Snapshots, what grew between two of them, and which of them stay in the history.
#include "facts/growth.hpp"

#include <sys/stat.h>
#include <unistd.h>

#include "db_snapshots.hpp"
#include "facts/growth_facts.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "fixture.hpp"
#include "vorn/paths.h"

namespace vornreport {
namespace {

constexpr int64_t kNow = 1'700'000'000;
constexpr int64_t kDay = 86400;

class GrowthTest : public UnitTest {
 protected:
  GrowthTest() {
    run_facts() = RunFacts();
    support::write_file(VORN_PATH_CONFIG, "");  // so that its folder is there
    support::write_file(VORN_PATH_HISTORY_SCHEMA,
                        support::read_file(VORN_TEST_SOURCE_DIR "/sql/vornreport.sql"));
  }
  ~GrowthTest() override { unlink(VORN_PATH_HISTORY_DB); }

  static Snapshot set_of(const std::string& summary, const std::string& details,
                         int64_t time = kNow) {
    const auto set = snapshot_of(time, {"1\n" + summary, "1\n" + details});
    EXPECT_TRUE(set) << summary << details;
    return set.value_or(Snapshot());
  }
  // One share on one volume, with its folders.
  static Snapshot folders(const char* all, const std::string& lines) {
    return set_of("s\ta\t1\nv\t/v\t0\t0\n", std::string("s\ta\t") + all + "\nv\t/v\n" + lines);
  }
  static std::string shown(const std::vector<Change>& changes) {
    std::string text;
    for (const Change& one : changes) {
      text += std::string(word_of(one.kind)) + " " + one.share + " " + one.volume + " " + one.name +
              " " + std::to_string(one.files) + " " + std::to_string(one.bytes) + "\n";
    }
    return text;
  }
  static bool store(int64_t time, size_t folder_count = 0, const char* profile = "p") {
    Snapshot set = set_of("s\ta\t1\nv\t/v\t1\t10\n", "", time);
    for (size_t i = 0; i < folder_count; ++i) {
      set.shares[0].folders.push_back({"f" + std::to_string(i), "/v", {1, i}});
    }
    set.quotas = {{"/v", "anna", 1, 2}, {"/v", "bert", 1, 2}};
    return SnapshotStorePending(profile, std::move(set));
  }
};

TEST_F(GrowthTest, TextHoldsAnyName) {
  const std::string odd = "back\\slash\ttab\nline\xff\x01 '\"";
  Snapshot set;
  set.owners_among = "anna,";
  set.shares.push_back({"a", true, true, {{odd, {1, UINT64_MAX}, {{odd, {2, 3}}}, {}}}, {}});
  set.shares[0].folders.push_back({odd, odd, {4, 5}});
  set.quotas.push_back({odd, odd, 6, 7});
  ASSERT_TRUE(SnapshotStorePending("p", set) && SnapshotMarkValid("p", 0, 0));
  const auto read = SnapshotRead("p", 0);
  ASSERT_TRUE(read);
  const SnapshotText text = to_text(*read);
  EXPECT_EQ(text.summary + text.details, to_text(set).summary + to_text(set).details);
  EXPECT_EQ(read->shares[0].folders[0].folder + read->quotas[0].user, odd + odd);
  EXPECT_EQ(read->shares[0].parts[0].total.bytes, UINT64_MAX);
}

TEST_F(GrowthTest, DamagedTextsAreNone) {
  for (const auto& [summary, details] : {std::pair{"", ""},
                                         {"2\n", ""},
                                         {"1\ns\ta", ""},
                                         {"1\ns\ta\n", ""},
                                         {"1\nv\t/v\t1\t1\n", ""},
                                         {"1\ns\ta\t1\nv\t/v\t1\t-1\n", ""},
                                         {"1\n", "1\ns\tstranger\t1\n"},
                                         {"1\ns\ta\t1\n", "1\ns\ta\t1\nf\tx\t1\t1\n"}}) {
    EXPECT_FALSE(snapshot_of(0, {summary, details})) << summary << details;
  }
  EXPECT_TRUE(snapshot_of(0, {"1\nz\tunknown\nnor this\n", "1\n"}));
}

TEST_F(GrowthTest, NamesAreKeptOnlyWhereTheyMayBeTold) {
  struct stat status {};
  status.st_uid = 7;
  tallies().clear();
  tallies().begin_share("a", "/srv/a", kNow);
  tallies().file({"a", "/srv/a/1", "1", "image", &status}, RowSource::kWalk);
  tallies().end_share();
  const auto details = [](const char* report_list) {
    return to_text(take_snapshot(run_facts(), tallies(), report_list)).details;
  };
  EXPECT_EQ(details("file_owner,share_list"), "1\ns\ta\t1\nv\t/\n");  // nobody noted the names
  run_facts().owners = {{7, "anna"}};
  run_facts().limit_user = {"anna"};
  EXPECT_EQ(details("file_group"),
            "1\nO\tanna,\nT\ns\ta\t1\nv\t/\no\tanna\t1\t0\nt\timage\t1\t0\n");
  record_incident("users_unknown", "7", "said", AlreadyLogged::kYes);
  EXPECT_EQ(details(""), "1\ns\ta\t1\nv\t/\n");
  tallies().clear();
}

TEST_F(GrowthTest, Bases) {
  const auto bases = [](std::vector<int64_t> days) {
    for (int64_t& day : days) {
      day = kNow - day * kDay;
    }
    const GrowthBases found = growth_bases(days, kNow);
    std::string text;
    for (const auto& time : {found.last, found.week, found.month}) {
      text += (time ? std::to_string((kNow - *time) / kDay) : "-") + " ";
    }
    return text;
  };
  EXPECT_EQ(bases({}), "- - - ");
  EXPECT_EQ(bases({1, 5, 9, 20, 40}), "1 5 20 ");  // of two that are as near the later ...
  EXPECT_EQ(bases({4, 15, 19, 61}), "4 - - ");
  EXPECT_EQ(bases({14, 60}), "14 14 60 ");
  EXPECT_EQ(bases({-1, -400, 3}), "3 - - ");  // the clock was ahead
}

TEST_F(GrowthTest, SharesThatBothReadAsAWhole) {
  const Snapshot then = set_of(
      "s\ta\t1\nv\t/v\t10\t100\nv\t/w\t1\t1\ns\tpart\t0\nv\t/v\t9\t9\ns\tpart now\t1\n"
      "s\tremoved\t1\nv\t/v\t5\t5\ns\thuge\t1\nv\t/v\t0\t18446744073709551615\n",
      "O\t\nT\ns\ta\t1\nv\t/v\no\tanna\t4\t40\no\tgone\t1\t2\nt\timage\t4\t40\n");
  const Snapshot now = set_of(
      "s\ta\t1\nv\t/v\t12\t90\ns\tpart\t1\ns\tpart now\t0\ns\tnew\t1\nv\t/v\t7\t7\n"
      "s\thuge\t1\nv\t/v\t0\t0\n",
      "O\t\nT\ns\ta\t1\nv\t/v\no\tanna\t5\t41\no\tnew\t1\t3\nt\timage\t4\t40\n");
  EXPECT_EQ(shown(changes_between(then, now)),
            "share a /v  2 -10\nshare a /w  -1 -1\n"
            "owner a /v anna 1 1\nowner a /v gone -1 -2\nowner a /v new 1 3\n"
            "type a /v image 0 0\nshare huge /v  0 -9223372036854775807\n");
  Snapshot limited = now;
  limited.owners_among = "anna,";
  limited.has_types = false;
  EXPECT_EQ(shown(changes_between(then, limited)),
            "share a /v  2 -10\nshare a /w  -1 -1\nshare huge /v  0 -9223372036854775807\n");
  EXPECT_EQ(shown(greatest_changes({"last", 0, changes_between(then, limited)})),
            "share huge   0 -9223372036854775807\nshare a   1 -11\n");
}

TEST_F(GrowthTest, Folders) {
  const struct {
    const char* then_all;
    const char* then;
    const char* now_all;
    const char* now;
    const char* changes;
  } cases[] = {
      {"1", "f\tx\t1\t10\n", "1", "f\tx\t3\t5\n", "folder a /v x 2 -5\n"},
      {"1", "f\t.\t1\t10\n", "0", "f\t.\t1\t10\nf\tx\t2\t8\n", "folder a /v x 2 8\n"},
      {"0", "f\t.\t1\t10\nf\ts\t1\t5\n", "1", "f\t.\t1\t10\nf\ts\t1\t5\nf\tx\t2\t8\nf\ty\t1\t5\n",
       "folder_at_least a /v x 0 3\n"},
      {"1", "f\t.\t1\t10\nf\tx\t2\t8\n", "1", "f\t.\t1\t10\n", "folder a /v x -2 -8\n"},
      {"1", "f\t.\t1\t10\nf\tx\t2\t8\nf\ty\t1\t6\n", "0", "f\t.\t1\t10\nf\ts\t1\t6\n",
       "folder a /v s 1 6\nfolder_at_least a /v x 0 -2\n"},
      {"0", "", "1", "f\tx\t2\t8\n", ""},
  };
  for (const auto& one : cases) {
    auto changes = changes_between(folders(one.then_all, one.then), folders(one.now_all, one.now));
    changes.erase(changes.begin());  // of the share
    EXPECT_EQ(shown(changes), one.changes);
  }
}

// However many there are, and whatever their names take.
TEST_F(GrowthTest, OnlyTheFoldersThatChangedTheMost) {
  std::string gone, come;
  for (int i = 1; i <= 6000; ++i) {
    gone += "f\tg" + std::to_string(i) + "\t1\t" + std::to_string(i) + "\n";
    come += "f\tc" + std::to_string(i) + "\t1\t" + std::to_string(i) + "\n";
  }
  const std::string told = shown(changes_between(folders("1", gone), folders("1", come)));
  EXPECT_EQ(std::count(told.begin(), told.end(), '\n'), 1 + 2 * 500);
  for (const char* edge : {" c5501 1 5501\n", " c6000 1 6000\n", " g5501 -1 -5501\n"}) {
    EXPECT_NE(told.find(edge), std::string::npos) << edge;
  }
}

TEST_F(GrowthTest, TheGreatestOfEachKind) {
  std::vector<Change> changes;
  for (int64_t i = 1; i <= 300; ++i) {
    changes.push_back({i % 2 == 0 ? GrowthKind::kFolder : GrowthKind::kFolderAtLeast, "a", "/v",
                       std::to_string(i), 0, i % 3 == 0 ? -i : i});
  }
  changes.push_back({GrowthKind::kType, "a", "/v", "image", 0, 0});
  changes.push_back({GrowthKind::kOwner, "b", "/v", "anna", 1, 5});
  changes.push_back({GrowthKind::kOwner, "a", "/v", "zoe", -1, -5});
  changes.push_back({GrowthKind::kOwner, "a", "/v", "bert", 2, 5});
  const auto rows = greatest_changes({"last", 0, changes});
  ASSERT_EQ(rows.size(), 203U);
  EXPECT_EQ(shown({rows.begin(), rows.begin() + 4}),
            "owner a  bert 2 5\nowner a  zoe -1 -5\nowner b  anna 1 5\nfolder a  300 0 -300\n");
  EXPECT_EQ(rows.back().bytes, 101);
}

TEST_F(GrowthTest, CausesOfAVolume) {
  const auto folder = [](const char* share, const char* name, int64_t bytes) {
    return Change{GrowthKind::kFolder, share, "/v", name, 0, bytes};
  };
  const Growth growth{{"last", 9, {}},
                      {"week",
                       5,
                       {{GrowthKind::kShare, "a", "/v", "", 0, 100},
                        {GrowthKind::kShare, "b", "/v", "", 0, -30},
                        {GrowthKind::kShare, "b", "/w", "", 0, 7},
                        {GrowthKind::kOwner, "a", "/v", "anna", 0, 80},
                        {GrowthKind::kOwner, "b", "/v", "anna", 0, -15},
                        {GrowthKind::kOwner, "b", "/w", "anna", 0, 1000},
                        folder("a", ".", 100),
                        folder("a", "x", 99),
                        folder("a", "x/y", 95),
                        folder("a", "x/y/z", 40),
                        folder("a", "xy", 94),
                        folder("b", "left out", 9)}}};
  const auto found = growth_on(growth, "/v");
  ASSERT_TRUE(found);
  EXPECT_EQ(std::pair(found->since, found->bytes), std::pair(int64_t{5}, int64_t{70}));
  std::string causes;
  for (const auto& cause : found->causes) {
    causes += cause.kind + " " + cause.share + " " + cause.name + " " +
              std::to_string(cause.bytes) + "\n";
  }
  EXPECT_EQ(causes,
            "share a  100\nfolder a x/y 95\nfolder a xy 94\nowner  anna 65\nfolder a x/y/z 40\n");
  EXPECT_FALSE(growth_on({}, "/v"));
}

// --- The store ----------------------------------------------------------------------------------

TEST_F(GrowthTest, OnlyFinishedRunsCount) {
  ASSERT_TRUE(store(kNow - 20));
  EXPECT_TRUE(SnapshotMarkValid("p", kNow - 20, kNow));
  ASSERT_TRUE(store(kNow - 10));  // killed
  ASSERT_TRUE(store(kNow - 15, 0, "other"));
  EXPECT_EQ(SnapshotTimes("p"), std::vector<int64_t>{kNow - 20});
  EXPECT_FALSE(SnapshotRead("p", kNow - 10));
  ASSERT_TRUE(store(kNow));
  EXPECT_TRUE(SnapshotMarkValid("p", kNow, kNow));
  EXPECT_FALSE(SnapshotMarkValid("p", kNow - 10, kNow));  // gone by now
  EXPECT_EQ(SnapshotTimes("p"), (std::vector<int64_t>{kNow - 20, kNow}));
  ASSERT_TRUE(store(kNow));  // of the same second, and fails
  SnapshotDrop("p", kNow);
  EXPECT_EQ(SnapshotTimes("p"), (std::vector<int64_t>{kNow - 20, kNow}));
  SnapshotDrop("p", kNow);
  EXPECT_EQ(SnapshotTimes("p"), std::vector<int64_t>{kNow - 20});
  EXPECT_TRUE(SnapshotMarkValid("other", kNow - 15, kNow));  // another profile's run goes on
  report_format::QuotaFacts user;
  user.volume = "/v";
  user.user = "anna";
  const auto samples = SnapshotSamplesOf("other", kNow - 15, {user});
  EXPECT_EQ(samples->shares.at("a").size(), 1U);
  EXPECT_EQ(samples->users.size(), 1U);
  EXPECT_EQ(samples->users.at({"/v", "anna"}).size(), 1U);
  EXPECT_TRUE(SnapshotSamplesOf("other", kNow - 16, {user})->shares.empty());
}

TEST_F(GrowthTest, ThinsOut) {
  const int64_t ahead = kNow + 900 * kDay;
  for (const int64_t time : {kNow - 731 * kDay, ahead}) {
    ASSERT_TRUE(store(time, 0, "removed profile") && SnapshotMarkValid("removed profile", time, 0));
  }
  for (int64_t day = 800; day >= 0; --day) {
    ASSERT_TRUE(store(kNow - day * kDay, day > 760 || (day > 36 && day < 50) ? 3000 : 0));
    ASSERT_TRUE(SnapshotMarkValid("p", kNow - day * kDay, kNow - day * kDay));
  }
  EXPECT_EQ(SnapshotTimes("removed profile"), std::vector<int64_t>{ahead});
  const auto times = SnapshotTimes("p").value();
  int64_t weeks = 0;
  for (size_t i = 0; i < times.size(); ++i) {
    const int64_t age = (kNow - times[i]) / kDay;
    EXPECT_LE(age, 730);
    const auto set = SnapshotRead("p", times[i]);
    EXPECT_EQ(set->folder_count(), age > 40 && age < 50    ? 500U
                                   : age > 36 && age <= 40 ? 2000U
                                                           : 0U)
        << age;
    EXPECT_EQ(set->quotas.size(), age > 91 ? 0U : 2U) << age;
    weeks += age > 40 ? 1 : 0;
    EXPECT_FALSE(age > 47 && (times[i] - times[i - (i > 0 ? 1 : 0)]) % (7 * kDay) != 0) << age;
    if (set->folder_count() != 0) {  // the largest ones
      EXPECT_EQ(set->shares[0].folders.front().folder, "f2999");
      EXPECT_FALSE(set->shares[0].has_all_folders);
    }
  }
  EXPECT_EQ(static_cast<int64_t>(times.size()) - weeks, 41);
  EXPECT_NEAR(static_cast<double>(weeks), (730 - 40) / 7.0, 1.5);
}

TEST_F(GrowthTest, AClockThatIsAheadThinsOutNothing) {
  for (const auto& [days_ahead, kept] : {std::pair{0, 31U}, {1, 31U}, {4, 31U}, {5, 1U}}) {
    unlink(VORN_PATH_HISTORY_DB);
    const auto finish = [](int64_t time) {
      return store(time) && SnapshotMarkValid("p", time, time);
    };
    for (int64_t day = 30; day > 0; --day) {
      ASSERT_TRUE(finish(kNow - day * kDay));
    }
    for (int64_t day = 0; day < days_ahead; ++day) {
      ASSERT_TRUE(finish(kNow + (1000 + day) * kDay) && finish(kNow + (1000 + day) * kDay + 1));
    }
    ASSERT_TRUE(finish(kNow));
    auto times = SnapshotTimes("p").value();
    std::erase_if(times, [](int64_t time) { return time > kNow; });
    EXPECT_EQ(times.size(), kept) << days_ahead;
  }
}

TEST_F(GrowthTest, ABrokenDatabaseIsToldOnce) {
  support::write_file(VORN_PATH_HISTORY_DB, "no database, and long enough to be taken for one");
  printed([] {
    EXPECT_FALSE(store(3));
    EXPECT_FALSE(SnapshotTimes("p"));
    EXPECT_FALSE(SnapshotMarkValid("p", 3, 3));
  });
  ASSERT_EQ(run_facts().incidents.size(), 1U);
  EXPECT_EQ(run_facts().incidents[0].kind, "history_lost");
}

}  // namespace
}  // namespace vornreport
