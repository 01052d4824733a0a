// Quotas: the tool's output in all its forms, the blocks, and a tool that doesn't behave.
#include "rep_quota_usage.hpp"
#include "report_fixture.hpp"
#include "shell.hpp"

namespace vornreport {
namespace {

class QuotaTest : public ReportTest {
 protected:
  ~QuotaTest() override { QAZLLfree(&list_, QuotaFreeVolume); }

  int parse(const std::string& output, const char* path = "/srv") {
    std::string copy = output;
    const FileHandle stream(fmemopen(copy.data(), copy.size(), "r"));
    int result = 0;
    output_ =
        printed([&] { result = QuotaUsageParse(stream.get(), &list_, path, 5000, users_.get()); });
    return result;
  }

  // "name used quota" of the kept users.
  std::string kept() const {
    std::string text;
    for (const auto& [used, user] : quota_volume_of(list_)->users) {
      text += user.name + " " + std::to_string(used) + " " + std::to_string(user.quota) + "\n";
    }
    return text;
  }

  QAZLLNode* list_ = nullptr;
};

constexpr char kHead[] =
    "*** Report for user quotas on device /dev/loop0\nBlock grace time: 7days\n"
    "                        Block limits\nUser            used    soft\n"
    "----------------------------------------------------------\n";

TEST_F(QuotaTest, ReadsTheUserTableInAllItsForms) {
  for (const char* name : {"ann", "bob", "eve", "x"}) {
    set(users_, name, "1");
  }
  const struct {
    const char* what;
    std::string lines;
    int result;
    const char* kept;
    uint64_t max_quota;
    uint64_t max_used;
  } cases[] = {
      {"a table", "ann  --  20  100  200  1 0 0\nbob  +-  10   0  0  1 0 0\n\n\n", 0,
       "bob 10 0\nann 20 100\n", 5000, 20},
      {"equal usage keeps the order", "eve -- 5 1 1\nann -- 5 2 1\n", 3, "eve 5 1\nann 5 2\n", 2,
       5},
      {"others count for the quota only", "root -- 900 9000 0 \nann -- 1 10 0\n", 3, "ann 1 10\n",
       9000, 1},
      {"short lines are dropped, one of four fields stays without quota",
       "ann\nbob --\neve -- 7\nx -- 8 300\n", 3, "x 8 0\n", 0, 0},
      {"numbers that are none", "ann -- many none 0\n", 3, "ann 0 0\n", 5000, 0},
      {"a byte of zero", std::string("ann -- 5 10 0\nx\0y -- 1 1 1\nbob -- 7 20 0\n", 41), 3,
       "ann 5 10\nbob 7 20\n", 20, 7},
      {"no user line", "", -1, "", 0, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    EXPECT_EQ(parse(kHead + c.lines), c.result);
    EXPECT_EQ(kept(), c.kept);
    EXPECT_EQ(quota_volume_of(list_)->maxQuota, c.max_quota);
    EXPECT_EQ(quota_volume_of(list_)->maxUserUsed, c.max_used);
    QAZLLfree(&list_, QuotaFreeVolume);
  }
  // Without the line of dashes nothing is a user line; a line beyond all bounds is one line.
  EXPECT_EQ(parse("ann -- 1 2 3\n"), -1);
  QAZLLfree(&list_, QuotaFreeVolume);
  EXPECT_EQ(parse(kHead + std::string(100000, 'z') + " -- 1 2 3\nann -- 1 2 3\n"), 3);
  EXPECT_EQ(kept(), "ann 1 2\n");
}

TEST_F(QuotaTest, EndsACommandAtItsLimits) {
  const CommandLimits limits{.seconds = 1, .bytes = 1000};
  const auto all = [](const FileHandle& stream) {
    std::string text;
    for (int c = std::fgetc(stream.get()); c != EOF; c = std::fgetc(stream.get())) {
      text += static_cast<char>(c);
    }
    return text;
  };
  printed([&] {
    EXPECT_EQ(run_limited("src/x", "exit 3", limits), 3);
    EXPECT_EQ(run_limited("src/x", "yes | head -c 900; exit 0", limits), 0);
    EXPECT_EQ(all(open_limited("src/x", "echo one; echo two", limits)), "one\ntwo\n");
    EXPECT_EQ(support::syslog_text(), "");
    EXPECT_EQ(run_limited("src/x", "sleep 600", limits), -1);
    EXPECT_EQ(run_limited("src/x", "exec yes no", limits), -1);
    EXPECT_EQ(all(open_limited("src/x", "echo one; sleep 600 | cat", limits)), "one\n");
    EXPECT_LE(all(open_limited("src/x", "yes", limits)).size(), 1000U);
  });
  const std::string log = without_errno(support::syslog_text());
  EXPECT_NE(log.find("command took too long, ended cmd=sleep 600\n"), std::string::npos) << log;
  EXPECT_NE(log.find("command took too long, ended cmd=echo one; sleep 600 | cat\n"),
            std::string::npos);
  EXPECT_NE(log.find("command printed too much, ended cmd=exec yes no\n"), std::string::npos);
  EXPECT_NE(log.find("command printed too much, ended cmd=yes\n"), std::string::npos);
}

}  // namespace
}  // namespace vornreport
