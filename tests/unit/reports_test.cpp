// The reports that differ from the frame's usual one, over a real statistics database.
#include <algorithm>
#include <random>
#include <sstream>

#include "rep_duplicate_file/content_groups.hpp"
#include "rep_duplicate_file/duplicate_file.hpp"
#include "rep_file_group.hpp"
#include "report_fixture.hpp"

namespace vornreport {
namespace {

constexpr char kScript[] = "<script type='text/javascript'>\n";

class ReportsTest : public ReportTest {
 protected:
  // Adds rows in one transaction.
  template <typename Work>
  void fill(Work&& work) {
    const SqliteHandle db = VORNReportDBInit(profile_.get());
    sqlite3_exec(db.get(), "BEGIN", nullptr, nullptr, nullptr);
    work(db.get());
    sqlite3_exec(db.get(), "COMMIT", nullptr, nullptr, nullptr);
  }

  using ReportTest::add;
  static void add(QAZLLNode** candidates, std::string path, std::string size,
                  const char* share_folder = nullptr) {
    char* columns[] = {const_cast<char*>("s"), path.data(), size.data(), const_cast<char*>("5"),
                       const_cast<char*>("n")};
    ASSERT_EQ(add_candidate(candidates, columns, 1, share_folder), 0);
  }
};

TEST_F(ReportsTest, FileGroupSectionsShareTheirLimit) {
  platform.users = {{"ann", 10}, {"bob", 20}};
  EXPECT_EQ(outcome(file_group_db, "file_group"), "\n}</script>\n|Group, Share, Size\n");
  fill([&](sqlite3* db) {
    add(db, "s", "a", 5, 10, 0, "doc");
    add(db, "s", "b", 7, 20, 0, "doc");
  });
  set_profile("limit_user", "ann,,ghost, bob");
  EXPECT_EQ(outcome(file_group_db, "file_group"),
            std::string(kScript) +
                "var vornFileGroupTableData = {\nvornAll : [\n[ 'doc', 's', 12 ]]\n,\nann : [\n"
                "[ 'doc', 's', 5 ]\n]\n,\nbob : [\n[ 'doc', 's', 7 ]\n]\n\n}</script>\n"
                "|Group, Share, Size\n");
  // 99 more types: the hundred rows end before ann's section, which keeps its closing bracket.
  fill([&](sqlite3* db) {
    for (int i = 0; i < 99; ++i) {
      add(db, "s", "t", 1, 10, 0, ("type" + std::to_string(i)).c_str());
    }
  });
  const std::string full = outcome(file_group_db, "file_group");
  EXPECT_EQ(std::count(full.begin(), full.end(), '['), 101);
  EXPECT_EQ(full.find("ann"), std::string::npos);
  EXPECT_NE(full.find("]]\n\n]\n\n]\n\n}</script>\n"), std::string::npos);
}

// What the pairwise walk over a bucket gives, computed the plain way.
struct Expected {
  std::string groups;  // paths of each group, last match first
  std::string lines;   // pairs that did not match
};

Expected pairwise(const std::vector<std::string>& paths, const std::vector<std::string>& samples,
                  const std::vector<std::string>& digests) {
  Expected expected;
  std::vector<bool> grouped(paths.size());
  for (size_t a = 0; a < paths.size(); ++a) {
    std::string chain;
    for (size_t b = a + 1; b < paths.size() && !grouped[a]; ++b) {
      if (grouped[b] || samples[a] != samples[b]) {
        continue;
      }
      if (digests[a].size() > 2 && digests[a] == digests[b]) {
        chain = paths[b] + " " + (chain.empty() ? paths[a] : chain);
        grouped[b] = true;
      } else {
        expected.lines += "(" + paths[a] + "," + paths[b] + ")\n";
      }
    }
    grouped[a] = grouped[a] || !chain.empty();
    expected.groups += chain.empty() ? "" : chain + "\n";
  }
  return expected;
}

// The paths of each group of a content mode CSV file, one line a group.
std::string groups_of(const std::string& csv) {
  std::istringstream lines(csv);
  std::string line;
  std::string last;
  std::string groups;
  std::getline(lines, line);  // the header
  while (std::getline(lines, line)) {
    const std::string number = line.substr(0, line.find('\t'));
    const size_t path = line.find("csv(") + 4;
    groups += number == last ? " " : last.empty() ? "" : "\n";
    groups += line.substr(path, line.find(')') - path);
    last = number;
  }
  return groups.empty() ? "" : groups + "\n";
}

// The pairs of the "not match" lines, one a line.
std::string mismatches_of(const std::string& output) {
  constexpr std::string_view kStart = "not match file=";
  std::string pairs;
  for (size_t at = output.find(kStart); at != std::string::npos; at = output.find(kStart, at + 1)) {
    const size_t begin = at + kStart.size();
    pairs += output.substr(begin, output.find('\n', begin) + 1 - begin);
  }
  return pairs;
}

// A bucket is looked up by sample; its groups and the order of its lines must be the pairwise
// walk's. Samples and digests are drawn from few values, some digests can't be had.
TEST_F(ReportsTest, ContentGroupsAreThoseOfThePairwiseWalk) {
  std::mt19937 random(7);
  for (int round = 0; round < 40; ++round) {
    std::vector<std::string> paths;
    std::vector<std::string> samples;
    std::vector<std::string> digests;
    const auto count = 2 + random() % 30;
    for (size_t i = 0; i < count; ++i) {
      paths.push_back(folder_.path("f" + std::to_string(i)));
      samples.emplace_back(1, static_cast<char>('a' + random() % 4));
      digests.emplace_back(std::array{"same", "other", "third", "2"}[random() % 4]);
      support::write_file(paths.back(), samples.back());
      platform.digests[paths.back()] = digests.back();
    }
    const std::string found = in_child([&] {
      QAZLLNode* candidates = nullptr;
      QAZLLNode* groups = nullptr;
      for (std::string& path : paths) {
        add(&candidates, path, "1");
      }
      const std::string output =
          printed([&] { handle_size_bucket(profile_.get(), &groups, &candidates); });
      return mismatches_of(output) + "|" + groups_of(csv("duplicate_file"));
    });
    const Expected expected = pairwise(paths, samples, digests);
    EXPECT_EQ(found, expected.lines + "|" + expected.groups);
    unlink(folder_.path("duplicate_file.csv").c_str());
  }
}

// A link that was put in a folder's place since the gathering is not followed to the file behind
// it.
TEST_F(ReportsTest, SamplesAreNotReadThroughLinks) {
  const std::string share = folder_.path("share");
  support::write_file(folder_.path("outside/f"), "secret");
  support::write_file(share + "/f", "secret");
  ASSERT_EQ(symlink("../outside", (share + "/in").c_str()), 0);
  QAZLLNode* candidates = nullptr;
  QAZLLNode* groups = nullptr;
  for (std::string path : {share + "/f", share + "/in/f"}) {
    add(&candidates, path, "6", share.c_str());
  }
  printed([&] { EXPECT_EQ(read_fast_digests(candidates), 0); });
  EXPECT_NE(file_of(candidates)->sample, file_of(candidates->next)->sample);
  EXPECT_NE(support::syslog_text().find("open file failed, file=" + share + "/in/f,(40)"),
            std::string::npos);
  release_bucket(&groups, &candidates);
}

}  // namespace
}  // namespace vornreport
