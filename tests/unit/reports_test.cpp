// The reports that differ from the frame's usual one, over a real statistics database.
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/inotify.h>
#include <sys/prctl.h>
#include <sys/syscall.h>

#include <algorithm>
#include <cstddef>
#include <filesystem>
#include <random>
#include <set>
#include <sstream>
#include <tuple>

#include "facts/run_facts.hpp"
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
                  const char* share_folder) {
    char* columns[] = {const_cast<char*>("s"), path.data(), size.data(), const_cast<char*>("5"),
                       const_cast<char*>("n")};
    ASSERT_EQ(add_candidate(candidates, columns, 1, share_folder), 0);
  }

  // What comparing files of one byte prints; their groups go to the CSV file.
  std::string compare(const std::vector<std::string>& paths) {
    const std::string share = folder_.path();
    QAZLLNode* candidates = nullptr;
    QAZLLNode* groups = nullptr;
    for (const std::string& path : paths) {
      add(&candidates, path, "1", share.c_str());
    }
    return printed([&] { handle_size_bucket(profile_.get(), &groups, &candidates); });
  }
};

TEST_F(ReportsTest, FileGroupSectionsShareTheirLimit) {
  platform.users = {{"ann", 10}, {"bob", 20}};
  EXPECT_EQ(outcome(file_group_db, "file_group"),
            "\n}</script>\n|\xEF\xBB\xBFGroup, Share, Size\n");
  fill([&](sqlite3* db) {
    add(db, "s", "a", 5, 10, 0, "doc");
    add(db, "s", "b", 7, 20, 0, "doc");
  });
  set_profile("limit_user", "ann,,ghost, bob");
  EXPECT_EQ(outcome(file_group_db, "file_group"),
            std::string(kScript) +
                "var vornFileGroupTableData = {\nvornAll : [\n[ 'doc', 's', 12 ]]\n,\nann : [\n"
                "[ 'doc', 's', 5 ]\n]\n,\nbob : [\n[ 'doc', 's', 7 ]\n]\n\n}</script>\n"
                "|\xEF\xBB\xBFGroup, Share, Size\n");
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
  std::string number;
  std::string share;
  std::string path;
  while (lines >> number >> share >> path && std::getline(lines, line)) {
    groups += (number == last ? " " : last.empty() ? "" : "\n") + path;
    last = number;
  }
  return groups.empty() ? "" : groups + "\n";
}

// What stands behind `start` in the lines that have it, one a line.
std::string rests_of(const std::string& output, std::string_view start) {
  std::string rests;
  for (size_t at = output.find(start); at != std::string::npos; at = output.find(start, at + 1)) {
    const size_t begin = at + start.size();
    rests += output.substr(begin, output.find('\n', begin) + 1 - begin);
  }
  return rests;
}

constexpr char kNoMatch[] = "not match file=";

// A bucket is looked up by sample; its groups and the order of its lines must be the pairwise
// walk's. Samples and digests are drawn from few values, some digests can't be had. None is asked
// for twice.
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
      const std::string output = compare(paths);
      const std::set<std::string> calls(platform.calls.begin(), platform.calls.end());
      return rests_of(output, kNoMatch) + "|" + groups_of(csv("duplicate_file")) +
             (calls.size() == platform.calls.size() ? "" : "asked twice");
    });
    const Expected expected = pairwise(paths, samples, digests);
    EXPECT_EQ(found, expected.lines + "|" + expected.groups);
    unlink(folder_.path("duplicate_file.csv").c_str());
  }
}

// As in a container that knows no openat2.
void deny_openat2() {
  sock_filter filter[] = {BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
                          BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_openat2, 0, 1),
                          BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | ENOSYS),
                          BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW)};
  const sock_fprog program{std::size(filter), filter};
  prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0);
  prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program);
}

// Since the gathering somebody may have put links, pipes or other folders in the way, and an index
// can name anything.
TEST_F(ReportsTest, OnlyTheSharesOwnFilesAreRead) {
  const std::string share = folder_.path("share");
  const std::string places[] = {"/f", "/in/f", "/../outside/f", "/pipe", "/moved/f"};
  support::write_file(folder_.path("outside/f"), "secret");
  support::write_file(share + "/f", "secret");
  ASSERT_EQ(symlink("../outside", (share + "/in").c_str()), 0);
  ASSERT_EQ(mkfifo((share + "/pipe").c_str(), 0600), 0);
  platform.digests[share + "/f"] = "digest";
  std::string failed;
  for (const std::string& place : places) {
    failed += place == "/f" ? "" : share + place + ", size=6\n";
  }
  for (const bool is_denied : {false, true}) {
    support::write_file(share + "/moved/f", "secret");
    const std::string found = in_child([&] {
      if (is_denied) {
        deny_openat2();
      }
      const int opens = inotify_init1(IN_NONBLOCK);
      inotify_add_watch(opens, folder_.path("outside/f").c_str(), IN_OPEN);
      inotify_add_watch(opens, (share + "/pipe").c_str(), IN_OPEN);
      QAZLLNode* candidates = nullptr;
      for (const std::string& place : places) {
        add(&candidates, share + place, "6", share.c_str());
      }
      const std::string output = printed([&] {
        read_fast_digests(candidates);
        std::filesystem::rename(share + "/moved", share + "/away");
        std::filesystem::create_directory(share + "/moved");
        support::write_file(share + "/moved/f", "guess!");
        for (const QAZLLNode* node = candidates->next; node != nullptr; node = node->next) {
          compare_files(*file_of(candidates), *file_of(node));
        }
      });
      char event[4096];
      return rests_of(output, "count md5 failed, file=") + platform.calls.back() +
             (platform.calls.size() == 1 && read(opens, event, sizeof event) < 0 ? "" : " more");
    });
    EXPECT_EQ(found, failed + "GetFileMd5 " + share + "/f");
    const std::string log = support::syslog_text();
    EXPECT_NE(
        log.find("open file failed, file=" + share + (is_denied ? "/in/f,(20)" : "/in/f,(40)")),
        std::string::npos);
    EXPECT_NE(log.find("open file failed, file=" + share + "/../outside/f,(18)"),
              std::string::npos);
    EXPECT_NE(log.find("map file failed, file=" + share + "/pipe,"), std::string::npos);
    EXPECT_EQ(log.find("md5"), std::string::npos);
    std::filesystem::remove_all(share + "/away");
    std::filesystem::remove_all(share + "/moved");
  }
}

// Equal files and different ones, and what fails in each way, in buckets that are read ahead
// together or one by one.
TEST_F(ReportsTest, ThreadsChangeNoLine) {
  const std::string share = folder_.path();
  const uintmax_t sizes[] = {3 << 20U, 70000, 5};
  std::mt19937 random(3);
  for (const uintmax_t size : sizes) {
    for (int i = 0; i < 40; ++i) {
      const std::string path = folder_.path(std::to_string(size) + "/" + std::to_string(i));
      const auto kind = random() % 20;
      support::write_file(path, "");
      std::filesystem::resize_file(path, size);
      if (kind < 3) {  // gone, a link, a pipe
        unlink(path.c_str());
        EXPECT_EQ(kind == 1   ? symlink("nothing", path.c_str())
                  : kind == 2 ? mkfifo(path.c_str(), 0600)
                              : 0,
                  0);
      }
      platform.digests[path] =
          i == 7 && size == 5 ? "-1" : std::array{"same", "other", "third", "2", "w"}[random() % 5];
    }
  }
  std::vector<std::string> found;
  for (const unsigned threads : {0U, 1U, 4U}) {
    found.push_back(in_child([&] {
      if (threads != 0) {
        begin_content_groups(profile_.get(), threads);
      }
      QAZLLNode* candidates = nullptr;
      QAZLLNode* groups = nullptr;
      const std::string output = printed([&] {
        for (const uintmax_t size : sizes) {
          for (int i = 0; i < 40; ++i) {
            const std::string text = std::to_string(size);
            add(&candidates, share + "/" + text + "/" + std::to_string(i), text, share.c_str());
          }
          errno = 0;
          handle_size_bucket(profile_.get(), &groups, &candidates,
                             size == 5 ? GroupsAre::kComplete : GroupsAre::kContinued);
        }
      });
      return output + csv("duplicate_file");
    }));
    unlink(folder_.path("duplicate_file.csv").c_str());
    support::syslog_lines();  // so that there is room for the next ones
    EXPECT_EQ(found.back(), found.front()) << threads;
  }
  for (const char* part :
       {"open file failed", "map file failed", "count md5 failed", "not match"}) {
    EXPECT_NE(found.front().find(part), std::string::npos) << part;
  }
}

// It ends before a digest or in the middle of one; what is known by then is grouped.
TEST_F(ReportsTest, TheComparisonEndsWithItsTime) {
  std::vector<std::string> paths;
  for (const auto& [name, digest] : TextMap{{"a", "one"}, {"b", "two"}, {"c", "two"}, {"d", "2"}}) {
    paths.push_back(folder_.path(name));
    support::write_file(paths.back(), "x");
    platform.digests[paths.back()] = digest;
  }
  const std::string pairs =
      "(" + paths[0] + "," + paths[1] + ")\n(" + paths[0] + "," + paths[2] + ")\n";
  for (const size_t digests : {0U, 3U, 4U}) {
    set_profile("duplicate_compare_minutes", "2");
    const std::string found = in_child([&] {
      run_facts().incidents.clear();
      begin_content_groups(profile_.get());
      platform.calls.clear();
      platform.is_past_deadline = [&] { return platform.calls.size() >= digests; };
      std::string output = compare(paths);
      output += compare({folder_.path("gone"), folder_.path("gone")});
      const auto& incidents = run_facts().incidents;
      return rests_of(output, kNoMatch) + rests_of(output, "open file failed") +
             groups_of(csv("duplicate_file")) +
             (incidents.empty() ? "" : incidents[0].kind + ": " + incidents[0].text);
    });
    EXPECT_EQ(found, (digests == 0 ? "" : pairs + paths[2] + " " + paths[1] + "\n") +
                         "compare_stopped: the comparison of contents reached its limit of 2 "
                         "minutes at files of "
                         "1\u00a0B; smaller ones were not compared; raise "
                         "duplicate_compare_minutes");
    EXPECT_EQ(support::syslog_lines().size(), 1U);
    unlink(folder_.path("duplicate_file.csv").c_str());
  }
  const std::tuple<const char*, const char*, size_t> values[] = {
      {"3", "180", 0}, {"0", "0", 0},  {"", "0", 0},
      {"-1", "0", 1},  {"1m", "0", 1}, {"99999999999", "0", 1}};
  for (const auto& [value, seconds, lines] : values) {
    set_profile("duplicate_compare_minutes", value);
    printed([&] { begin_content_groups(profile_.get()); });
    EXPECT_EQ(platform.calls.back(), std::string("SetDigestDeadline ") + seconds) << value;
    EXPECT_EQ(support::syslog_lines().size(), lines) << value;
  }
}

}  // namespace
}  // namespace vornreport
