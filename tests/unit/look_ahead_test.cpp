// Walks with threads: what they find, in which order, and how many there are.
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cmath>
#include <cstring>
#include <filesystem>
#include <functional>
#include <latch>
#include <random>

#include "facts/tallies.hpp"
#include "file_gathering/share_walk.hpp"
#include "report_fixture.hpp"
#include "thread_count.hpp"

namespace {

std::latch* g_answer = nullptr;  // what looks at files named "hangs" wait for

}  // namespace

// In place of the system's: there is no file system here that could be made to hang, and nobody who
// removes things just when they have been found or looked at.
extern "C" int fstatat(int folder, const char* name, struct stat* status, int flags) noexcept {
  if (g_answer != nullptr && std::strcmp(name, "hangs") == 0) {
    g_answer->wait();
  }
  if (std::strcmp(name, "goes") == 0) {
    unlinkat(folder, name, 0);
  }
  const long result = syscall(SYS_newfstatat, folder, name, status, flags);
  if (std::strcmp(name, "goes then") == 0) {
    unlinkat(folder, name, AT_REMOVEDIR);
  }
  return static_cast<int>(result);
}

namespace vornreport {
namespace {

using support::write_file;

class LookAheadTest : public StatisticsTest {
 protected:
  // Everything that a walk leaves: its rows in their order, and what it printed.
  std::string walked(const std::string& top, unsigned threads,
                     std::chrono::milliseconds silence = std::chrono::minutes(2)) {
    rows("begin");
    const std::string output = printed([&] {
      EXPECT_EQ(ReportShareWalk(db_.get(), "share", top.c_str(), types_.get(), threads, silence),
                0);
    });
    const std::string paths = rows("select path from file_stat order by id");
    rows("rollback");
    support::syslog_lines();
    return paths + output;
  }
};

// As one thread would list the files of a tree.
std::string listed(const std::string& folder) {
  std::string text;
  const DirHandle dir(opendir(folder.c_str()));
  while (const dirent* entry = dir ? readdir(dir.get()) : nullptr) {
    const std::string name = entry->d_name;
    if (entry->d_type == DT_REG) {
      text += folder + "/" + name + "\n";
    } else if (entry->d_type == DT_DIR && name != "." && name != ".." && name != "@eaDir") {
      text += listed(folder + "/" + name);
    }
  }
  return text;
}

TEST_F(LookAheadTest, FindsAllInTheOrderOfOneThread) {
  const std::string top = folder_.path("top");
  for (int i = 0; i < 300; ++i) {
    const std::string branch = top + "/" + std::to_string(i * 7919 % 300);
    write_file(branch + "/a", "");
    write_file(branch + "/b/" + std::string(static_cast<size_t>(i % 200) + 1, 'n') + "/c", "");
    write_file(branch + "/@eaDir/left out", "");
    std::filesystem::create_directories(branch + "/empty");
    std::filesystem::create_symlink(top, branch + "/link");
  }
  // More than is examined together, and more than is ever ahead.
  for (int i = 0; i < 40000; ++i) {
    write_file(top + "/many/" + std::to_string(i), "");
  }
  for (int i = 0; i < 6000; ++i) {
    write_file(top + "/wide/" + std::to_string(i) + "/f", "");
  }
  const std::string expected = listed(top);
  for (const unsigned threads : {1U, 3U, 16U, 0U}) {
    EXPECT_TRUE(walked(top, threads) == expected) << threads;  // too long to be shown
  }
}

// What can't be read is told in its place, the same by one thread and by many.
TEST_F(LookAheadTest, TellsWhatItCannotReadInItsPlace) {
  const std::string top = folder_.path("top");
  for (int i = 0; i < 60; ++i) {
    const std::string branch = top + "/" + std::to_string(i);
    write_file(branch + "/file", "");
    write_file(branch + "/shut/file", "");
    write_file(branch + "/blind/file", "");
    ASSERT_EQ(chmod((branch + "/shut").c_str(), 0), 0);
    ASSERT_EQ(chmod((branch + "/blind").c_str(), 0444), 0);  // names can be read, no more
  }
  ASSERT_EQ(chmod(folder_.path().c_str(), 0755), 0);
  const uid_t user = geteuid();
  if (user == 0) {
    rows("pragma journal_mode=memory");
    ASSERT_EQ(chmod(folder_.path("stat.db").c_str(), 0666), 0);
    ASSERT_EQ(seteuid(65534), 0);
  }
  const std::string one = walked(top, 1);
  const std::string many = walked(top, 16);
  ASSERT_EQ(seteuid(user), 0);
  EXPECT_EQ(one, many);
  for (const char* line : {"Failed to opendir [", "/shut].", "Failed to stat [", "/blind/file].",
                           "Permission denied", "Failed to process ["}) {
    EXPECT_NE(one.find(line), std::string::npos) << line;
  }
  EXPECT_EQ(std::count(one.begin(), one.begin() + static_cast<long>(one.find('(')), '\n'), 60);
}

// Temporary files come and go on a server at work, whose shares are whole all the same.
TEST_F(LookAheadTest, AShareDoesNotLackWhatWasRemoved) {
  const std::string top = folder_.path("top");
  write_file(top + "/stays", "");
  write_file(top + "/goes", "");
  std::filesystem::create_directories(top + "/goes then");
  tallies().begin_share("share", top.c_str(), 0);
  const std::string found = walked(top, 2);
  const ShareTally& share = *tallies().share();
  EXPECT_TRUE(share.is_whole() && share.total().files == 1) << found;
  for (const char* line : {"Failed to stat [", "Failed to opendir ["}) {
    EXPECT_NE(found.find(line), std::string::npos) << line;
  }
  tallies().clear();
}

TEST_F(LookAheadTest, GoesOnWithoutAThreadThatHangs) {
  const std::string top = folder_.path("top");
  write_file(top + "/a", "");
  write_file(top + "/b/hangs", "");
  static std::latch answer(1);  // the thread outlives this
  g_answer = &answer;
  const std::string found = walked(top, 4, std::chrono::milliseconds(300));
  g_answer = nullptr;
  answer.count_down();  // what comes now has nobody to take it
  for (const std::string& part : {top + "/a\n", std::string("(Connection timed out)"),
                                  "Failed to opendir [" + top + "/b]."}) {
    EXPECT_NE(found.find(part), std::string::npos) << found;
  }
}

// --- The number of threads ----------------------------------------------------------------------

struct Device {
  const char* name;
  std::function<double(unsigned threads)> rate;  // looks per second
};

const Device kDevices[] = {
    // One head that goes from one thread's folder to the other's.
    {"one head", [](unsigned n) { return n == 1 ? 100.0 : 60.0 / std::sqrt(n); }},
    {"an array of 8", [](unsigned n) { return 100.0 * std::min(n, 8U) - (n > 8 ? 40.0 : 0.0); }},
    {"a solid state disk", [](unsigned n) { return 9000.0 * n / (n + 5.0); }},
    {"a far server", [](unsigned n) { return 50.0 * n; }},
    // Two processors, one of which the consumer needs for a while.
    {"a warm cache", [](unsigned n) { return n == 1 ? 500e3 : 560e3 - 20e3 * n; }},
};

// Seconds for a number of looks on a device whose rate differs by a twentieth from stretch to
// stretch.
double seconds_for(const Device& device, double looks, ThreadCount* count, unsigned fixed) {
  constexpr double kStretch = 0.1;
  std::mt19937 random(1);
  std::uniform_real_distribution<double> noise(0.95, 1.05);
  double seconds = 0;
  for (double done = 0; done < looks; seconds += kStretch) {
    const double rate = device.rate(count != nullptr ? count->count() : fixed) * noise(random);
    done += rate * kStretch;
    if (count != nullptr) {
      count->end_stretch(rate, false);
    }
  }
  return seconds;
}

TEST(ThreadCountTest, FindsWhatIsFastOnEveryDevice) {
  for (const Device& device : kDevices) {
    double best_rate = 0;
    for (unsigned n = 1; n <= ThreadCount::kMost; ++n) {
      best_rate = std::max(best_rate, device.rate(n));
    }
    constexpr double kMinute = 60;
    double best = 1e9;
    for (unsigned n = 1; n <= ThreadCount::kMost; ++n) {
      best = std::min(best, seconds_for(device, best_rate * kMinute, nullptr, n));
    }
    for (const unsigned begin : {1U, 2U}) {
      ThreadCount count(begin);
      const double found = seconds_for(device, best_rate * kMinute, &count, 0);
      EXPECT_LT(found, best * 1.15) << device.name << ": ends with " << count.count();
    }
  }
}

TEST(ThreadCountTest, GoesDownWhileNobodyTakesWhatIsFound) {
  ThreadCount count;
  for (int i = 0; i < 5; ++i) {
    count.end_stretch(1000, true);
  }
  EXPECT_EQ(count.count(), 1U);
  // The cache has come to its end: now the disk decides.
  for (int i = 0; i < 40; ++i) {
    count.end_stretch(100.0 * std::min(count.count(), 8U), false);
  }
  EXPECT_GE(count.count(), 8U);
}

}  // namespace
}  // namespace vornreport
