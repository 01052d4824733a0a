// The facts of a run: what is counted, what may be told, what deserves attention, and the file.
#include "report_format/facts.hpp"

#include <sys/stat.h>
#include <unistd.h>

#include "facts/assemble.hpp"
#include "facts/attention.hpp"
#include "facts/duplicate_tally.hpp"
#include "facts/progress.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "fixture.hpp"
#include "report_format/attention.hpp"
#include "report_format/facts_file.hpp"
#include "report_format/run_state.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

using report_format::Facts;
using report_format::Level;

constexpr int64_t kNow = 1'700'000'000;
constexpr int64_t kDay = 86400;
constexpr char kAll[] = "share_list,file_owner,file_group,quota_usage,duplicate_file,least_modify";

class FactsTest : public UnitTest {
 protected:
  FactsTest() {
    run_facts() = RunFacts();
    run_facts().started = kNow;
    tallies().clear();
    source_.now = kNow;
    source_.report_list = kAll;
    source_.has_walked = true;
  }
  ~FactsTest() override { tallies().clear(); }

  struct File {
    const char* path;
    uint64_t size;
    uid_t owner = 0;
    const char* type = "image";
    int64_t mtime = kNow;
  };
  static void count(const File& file) {
    struct stat status {};
    status.st_size = static_cast<off_t>(file.size);
    status.st_uid = file.owner;
    status.st_dev = 1;
    status.st_nlink = 1;
    status.st_mtime = file.mtime;
    status.st_blocks = static_cast<blkcnt_t>((file.size + 511) / 512);
    tallies().file({"s", file.path, "", file.type, &status}, RowSource::kWalk);
  }
  static void share(const char* name, const char* path, const std::vector<File>& files) {
    tallies().begin_share(name, path, kNow);
    for (const File& file : files) {
      count(file);
    }
    tallies().end_share();
  }

  Facts facts() { return assemble_facts(run_facts(), tallies(), source_); }

  // The codes of the attention list with their first values, the worst first.
  std::string attention() {
    std::string all;
    for (const report_format::Attention& entry : facts().attention) {
      all += std::string(word_of(entry.level)) + " " + entry.code;
      const auto& first = entry.values.front().second;
      const auto* text = std::get_if<std::string>(&first);
      all += " " + (text != nullptr ? *text : std::to_string(std::get<int64_t>(first))) + "\n";
    }
    return all;
  }

  FactsSource source_;
};

TEST_F(FactsTest, SumsOfSparseFilesStayAtTheGreatestNumber) {
  share("a", "/srv/a", {{"/srv/a/1", INT64_MAX}, {"/srv/a/2", INT64_MAX}, {"/srv/a/3", 5}});
  EXPECT_EQ(facts().shares->front().bytes, UINT64_MAX);
  share("b", "/srv/b", {{"/srv/b/1", 1}});
  EXPECT_EQ(facts().types->front().bytes, UINT64_MAX);
}

TEST_F(FactsTest, TellsOnlyWhatWasAskedFor) {
  share("a", "/srv/a", {{"/srv/a/1", 1, 1, "image", kNow - 100 * kDay}});
  run_facts().owners = {{1, "anna"}};
  source_.report_list = "large_file,volume_usage";
  const Facts found = facts();
  EXPECT_TRUE(found.shares);
  EXPECT_FALSE(found.owners || found.types || found.ages || found.quotas || found.duplicates);
  EXPECT_EQ(attention(), "");
  ASSERT_EQ(found.reports.size(), 2U);
  EXPECT_EQ(found.reports[0].name, "volume_usage");
  source_.has_walked = false;
  EXPECT_FALSE(facts().shares);
}

TEST_F(FactsTest, VolumesStandByUrgency) {
  const uint64_t kSize = 1000;
  platform.volume_ids = {{"/used", "u"}, {"/full", "f"}, {"/most", "m"}, {"/fine", "ok"}};
  run_facts().volumes = {{"/fine", kSize, 990, kNow},
                         {"/most", kSize, 20, kNow},
                         {"/full", kSize, 0, kNow},
                         {"/used", kSize, 130, kNow},
                         {"/none", 0, 0, kNow}};
  const Facts found = facts();
  std::string order;
  for (const report_format::VolumeFacts& volume : found.volumes) {
    order += volume.path + " " + volume.id + " " + word_of(volume.level) + "\n";
  }
  EXPECT_EQ(order, "/full f critical\n/most m critical\n/used u warning\n/fine ok ok\n/none  ok\n");
  EXPECT_EQ(attention(),
            "critical volume_full /full\ncritical volume_used /most\nwarning volume_used /used\n");
}

// A volume that fills up soon is told by its days, unless its use alone is the worse news.
TEST_F(FactsTest, SamplesBelongToTheirVolume) {
  const std::string begin = "/volumes/with/one/beginning/31b";  // what the history keeps
  ASSERT_EQ(begin.size(), 31U);
  std::vector<report_format::Sample> rising;
  for (int day = 30; day > 0; --day) {
    rising.push_back({kNow - day * kDay, static_cast<uint64_t>(700'000 - day * 5000)});
  }
  source_.samples = {{"/grows", rising}, {begin, rising}};
  run_facts().volumes = {{"/grows", 1'000'000, 300'000, kNow},
                         {begin + "-a", 1'000'000, 300'000, kNow},
                         {begin + "-b", 1'000'000, 300'000, kNow}};
  const Facts found = facts();
  EXPECT_EQ(found.volumes[0].path, "/grows");
  EXPECT_EQ(found.volumes[0].forecast.days, 60);
  EXPECT_EQ(found.volumes[1].forecast.state, report_format::ForecastState::kShort);
  EXPECT_EQ(found.volumes[2].samples.size(), 1U);
  EXPECT_EQ(attention(), "warning volume_fills /grows\n");
}

TEST_F(FactsTest, QuotasNearestToTheirLimit) {
  QuotaTally tally;
  QuotaTally other;
  for (uint64_t i = 1; i <= 30; ++i) {
    (i % 2 == 0 ? tally : other).add("/", "u" + std::to_string(i), 80 + i, 100);
  }
  for (int i = 0; i < 3000; ++i) {
    tally.add("/", "calm", 1, 100);
  }
  tally.add("/", "unlimited", 1'000'000, 0);
  tally.add(std::move(other));
  EXPECT_EQ(tally.all().size(), 3030U);
  ASSERT_EQ(tally.users().size(), 20U);
  EXPECT_EQ(tally.users().front().user, "u30");
  EXPECT_EQ(tally.users().back().user, "u11");
  EXPECT_EQ(tally.pressing(), 21U);
  run_facts().quotas = tally;
  EXPECT_EQ(attention(),
            "critical quota_over u30\ncritical quota_over u29\ncritical quota_over u28\n"
            "critical quota_more 18\n");
  run_facts().quotas.emplace();
  run_facts().quotas->add("/", "anna", 90, 100);
  run_facts().quotas->add("/", "bjoern", 89, 100);
  EXPECT_EQ(attention(), "warning quota_near anna\n");
}

TEST_F(FactsTest, QuotasThatSoonAreUsedUp) {
  run_facts().quotas.emplace();
  run_facts().quotas->add("/", "calm", 850, 1000);
  run_facts().quotas->add("/", "fast", 750, 1000);
  for (int64_t day = 1; day < 12; ++day) {
    source_.snapshots.users[{"/", "fast"}].push_back(
        {kNow - day * kDay, static_cast<uint64_t>(750 - 25 * day)});
  }
  const auto quotas = facts().quotas.value();
  EXPECT_EQ(quotas[0].user + " " + quotas[1].user, "fast calm");
  EXPECT_EQ(quotas[0].forecast->days, 10);
  EXPECT_EQ(quotas[1].forecast->state, report_format::ForecastState::kShort);
  EXPECT_EQ(attention(), "warning quota_near fast\n");
}

TEST_F(FactsTest, GrowthIsToldWhereItIsAskedFor) {
  share("a", "/srv/a", {{"/srv/a/1", 100, 1}, {"/srv/a/2", 50, 2, "text"}});
  share("new", "/srv/new", {{"/srv/new/1", 10, 1}});
  run_facts().volumes = {{"/", 1000, 500, kNow}};
  run_facts().owners = {{1, "anna"}};
  source_.snapshots.shares["a"] = {{kNow - kDay, 30}};
  const std::vector<Change> changes{{GrowthKind::kShare, "a", "/", "", 1, 60},
                                    {GrowthKind::kOwner, "a", "/", "anna", 1, 40},
                                    {GrowthKind::kType, "a", "/", "image", 1, -3},
                                    {GrowthKind::kFolder, "a", "/", "x", 1, 29}};
  const Facts none = facts();
  EXPECT_FALSE(none.shares->front().grown || none.owners->front().grown ||
               none.volumes[0].grown_by);
  EXPECT_EQ(none.shares->front().samples->size(), 2U);
  EXPECT_EQ(none.volumes[0].filled_by->size(), 3U);  // two shares and an owner

  run_facts().growth = {{"last", kNow - kDay, {}}, {"week", kNow - 7 * kDay, changes}};
  const Facts grown = facts();
  EXPECT_FALSE(grown.shares->front().grown->last || grown.shares->front().grown->month);
  EXPECT_EQ(grown.shares->front().grown->week->bytes, 60);
  EXPECT_FALSE(grown.shares->back().grown->week);
  EXPECT_EQ(grown.owners->front().grown->week->bytes, 40);
  EXPECT_EQ(grown.types->front().grown->week->bytes, -3);
  ASSERT_EQ(grown.volumes[0].grown_by->size(), 3U);
  EXPECT_EQ(grown.volumes[0].grown_by->front().since, kNow - 7 * kDay);
  const auto entry = std::find_if(grown.attention.begin(), grown.attention.end(),
                                  [](const auto& one) { return one.section == "growth"; });
  ASSERT_NE(entry, grown.attention.end());
  EXPECT_EQ(entry->code, "volume_grew_in_by");  // no folder has half of it
  EXPECT_EQ(std::get<std::string>(*entry->find("place")), "a");

  run_facts().owners.reset();
  source_.report_list = "share_list";
  const Facts less = facts();
  EXPECT_FALSE(less.owners || less.types);
  EXPECT_EQ(less.volumes[0].filled_by->size(), 2U);
}

TEST_F(FactsTest, NoSuperlativeOfADoubtfulSum) {
  share("small", "/srv/a", {{"/srv/a/1", 1, 1, "image", kNow - 91 * kDay}});
  share("large", "/srv/b", {{"/srv/b/old", 5, 1, "image", kNow - 90 * kDay}});
  run_facts().owners = {{1, "anna"}};
  run_facts().duplicates = {{.by_content = true, .groups = 2, .files = 5, .reclaimable = 77}};
  const std::string rest = "ok duplicates_confirmed 77\nok data_oldest 1692137600\n";
  EXPECT_EQ(attention(), "ok share_largest large\nok owner_most anna\n" + rest);
  record_incident("quota_failed", "/", "said", AlreadyLogged::kYes);
  EXPECT_EQ(attention(), "ok share_largest large\nok owner_most anna\n" + rest);
  record_incident("share_part", "small: 1", "said", AlreadyLogged::kYes);
  EXPECT_EQ(attention(), rest);
}

TEST_F(FactsTest, IncidentsAreToldOnce) {
  const std::string printed_text = printed([] {
    record_incident("share_missing", "a\xff", "share a\xff is missing");
    record_incident("share_missing", "a\xff", "share a\xff is missing");
    record_incident("index_refused", "a", "said elsewhere", AlreadyLogged::kYes);
    record_incident("no_such_kind", "a", "unheard of");
  });
  const std::string log = support::syslog_text();
  EXPECT_NE(log.find("is missing"), std::string::npos);
  EXPECT_EQ(log.find("is missing"), log.rfind("is missing"));
  EXPECT_EQ(printed_text.find("said elsewhere"), std::string::npos);
  const Facts found = facts();
  ASSERT_EQ(found.incidents.size(), 2U);
  EXPECT_EQ(found.incidents[0].what, "a\\xff");
  EXPECT_FALSE(found.complete);
  run_facts().incidents.erase(run_facts().incidents.begin());
  EXPECT_TRUE(facts().complete);
}

TEST_F(FactsTest, DuplicatesCountPhysicalFilesOnce) {
  const std::string top = folder_.path();
  for (const char* name : {"one", "two", "other"}) {
    support::write_file(folder_.path(name), "12345");
  }
  ASSERT_EQ(link(folder_.path("one").c_str(), folder_.path("linked").c_str()), 0);
  ASSERT_EQ(symlink(folder_.path("two").c_str(), folder_.path("points").c_str()), 0);
  DuplicateTally tally(/*by_content=*/false);
  const auto group = [&](const std::vector<const char*>& names) {
    for (const char* name : names) {
      tally.file(top.c_str(), folder_.path(name).c_str());
    }
    tally.end_group(5);
  };
  group({"one", "linked"});  // one file
  EXPECT_EQ(tally.facts().reclaimable, 0U);
  group({"one", "two", "linked", "one"});  // two
  EXPECT_EQ(tally.facts().reclaimable, 5U);
  group({"gone", "points", "other"});  // what can't be looked at counts by its path
  tally.end_group(5);                  // nothing
  EXPECT_EQ(std::tuple(tally.facts().groups, tally.facts().files, tally.facts().reclaimable),
            std::tuple(3U, 6U, 15U));
}

TEST_F(FactsTest, ProgressIsWrittenTenTimesASecondAtMost) {
  progress_begin("p1", 9);
  for (uint64_t files = 1; files <= 1'000'000; ++files) {
    progress_file(files);
  }
  for (int i = 0; i < 100; ++i) {
    progress_share("s");
  }
  progress_end();
  ASSERT_LE(platform.progress.size(), 30U);  // over well under two seconds
  EXPECT_EQ(platform.progress.back(), "end p1");
  const auto first = report_format::progress_of(platform.progress.front());
  ASSERT_TRUE(first);
  EXPECT_EQ(first->reports, 9);
  const auto last = report_format::progress_of(platform.progress[platform.progress.size() - 2]);
  ASSERT_TRUE(last);
  EXPECT_EQ(last->share, "s");
}

// --- The file ---------------------------------------------------------------------------------

// Every key is there, in its order, null where nothing is known.
TEST(FactsFile, IsReadAndWrittenToTheByte) {
  const std::string text = support::read_file(VORN_TEST_SOURCE_DIR "/tests/fuzz/seeds/facts/full");
  const std::optional<Facts> read = report_format::facts_of(text);
  ASSERT_TRUE(read);
  EXPECT_EQ(report_format::to_line(*read) + "\n", text);
  EXPECT_EQ(read->incidents[0].what, "</script>");
  EXPECT_EQ(read->volumes[0].size, UINT64_MAX);
  EXPECT_EQ(read->volumes[0].forecast.jump->bytes, -5);
  EXPECT_EQ(std::get<double>(*read->attention[0].find("percent")), 1.5);
  EXPECT_TRUE(read->duplicates->by_content);
  EXPECT_EQ(report_format::started_of(text), kNow);
}

// It may come from elsewhere: whatever stands in it, a reader gets its own defaults or nothing.
TEST(FactsFile, SurvivesForeignTexts) {
  for (const char* text :
       {"", "[]", "{}", "null", "{\"format\":2}", "{\"format\":1", "\xff", "{\"format\":\"1\"}"}) {
    EXPECT_FALSE(report_format::facts_of(text)) << text;
  }
  const std::string deep(100'000, '[');
  EXPECT_FALSE(report_format::facts_of("{\"format\":1,\"volumes\":" + deep));
  std::string wide = "{\"format\":1";  // each key of an object is looked up among the others
  for (int i = 0; i < 256; ++i) {
    wide += ",\"" + std::to_string(i) + "\":0";
  }
  EXPECT_FALSE(report_format::facts_of(wide + "}"));
  const auto facts = report_format::facts_of(
      "{\"format\":1,\"started\":-1.5,\"host\":7,\"volumes\":[3,{\"size\":-1,\"samples\":[[1],"
      "[2,3],4],\"forecast\":\"x\",\"level\":\"awful\"}],\"shares\":{},\"attention\":[{\"values\":"
      "[]}],\"reports\":null,\"quotas\":7,\"new\":{}}");
  ASSERT_TRUE(facts);
  EXPECT_EQ(facts->started, 0);
  ASSERT_EQ(facts->volumes.size(), 2U);
  EXPECT_EQ(facts->volumes[1].size, 0U);
  EXPECT_EQ(facts->volumes[1].samples[1].used, 3U);
  EXPECT_EQ(facts->volumes[1].level, Level::kOk);
  for (const auto& [text, started] : std::vector<std::pair<std::string, std::optional<int64_t>>>{
           {"{\"a\":{\"started\":5},\"started\":6,\"rest\":", 6},
           {"{\"a\":[{\"started\":5}]}", {}},
           {"{\"started\":\"5\",\"b\":7}", {}},
           {"{\"started\":-5}", {}},
           {"[\"started\",5]", {}},
           {deep, {}}}) {
    EXPECT_EQ(report_format::started_of(text), started) << text.substr(0, 40);
  }
}

TEST(FactsFile, IsAPlainFileOfNoGreatSize) {
  const support::TempFolder folder;
  const std::string file = folder.path("report.json");
  const std::string good = R"({"format": 1})";
  support::write_file(folder.path("elsewhere"), good);
  const std::pair<bool, std::function<void()>> places[] = {
      {false, [] {}},  // absent
      {false, [&] { support::write_file(file, "{\"format\": 1"); }},
      {false, [&] { ASSERT_EQ(symlink(folder.path("elsewhere").c_str(), file.c_str()), 0); }},
      {false, [&] { ASSERT_EQ(mkfifo(file.c_str(), 0600), 0); }},
      {false,
       [&] { support::write_file(file, good + std::string(report_format::kLargestFacts, ' ')); }},
      {true, [&] { support::write_file(file, good); }}};
  for (const auto& [is_good, place] : places) {
    unlink(file.c_str());
    place();
    EXPECT_EQ(report_format::read_facts(folder.path()).has_value(), is_good);
  }
}

}  // namespace
}  // namespace vornreport
