// What the tests share: files in a temporary folder, and what went to syslog.
#ifndef VORN_TESTS_SUPPORT_HPP
#define VORN_TESTS_SUPPORT_HPP

#include <sys/stat.h>

#include <functional>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "vorn/text.h"

namespace support {

// A folder that goes away, with what is in it, at the end of the scope.
class TempFolder {
 public:
  TempFolder();
  TempFolder(TempFolder&&) = delete;
  ~TempFolder();
  // The folder, or a name in it.
  std::string path(std::string_view name = "") const;

 private:
  std::string path_;
};

// Replaces the content of `path`; its folders are made. Throws when it can't.
void write_file(const std::string& path, std::string_view content);
// The content, or "<absent>".
std::string read_file(const std::string& path);
// Whether a name exists, dangling links included.
bool exists(const std::string& path);
// What lstat() tells; all zero for a name that doesn't exist.
struct stat status_of(const std::string& path);
// The names in a folder.
std::set<std::string> names_in(const std::string& folder);

// The syslog messages since the last call, without priority, time and tag. The socket is bound
// before the first test, so a test that only wants its own lines calls this once to begin with.
std::vector<std::string> syslog_lines();
// The lines of `syslog_lines` joined with newlines: for one expectation on all of them.
std::string syslog_text();

// Runs `work` in a forked child; the child ends with its result as exit status, without unwinding.
pid_t fork_child(const std::function<int()>& work);
// The exit status of `child`, or -signal.
int wait_child(pid_t child);
// Whether no expectation of `check` fails in a child: for what a process can do only once.
bool passes_in_child(const std::function<void()>& check);
// The same on a server in `zone`.
bool passes_in_zone(const char* zone, const std::function<void()>& check);

// A process that is in the middle of a run of `profile`, having done `work`, until it is killed.
class OtherRun {
 public:
  explicit OtherRun(
      const std::string& profile, const std::function<void()>& work = [] {});
  OtherRun(OtherRun&&) = delete;
  ~OtherRun() { end(); }
  bool started() const { return started_; }
  pid_t pid() const { return pid_; }
  void end();

 private:
  pid_t pid_ = -1;
  bool started_ = false;
};

struct FreeHash {
  void operator()(VLIBCSzHash* hash) const { VLIBCSzHashFree(hash); }
};
struct FreeList {
  void operator()(VLIBCSzList* list) const { VLIBCSzListFree(list); }
};
using Hash = std::unique_ptr<VLIBCSzHash, FreeHash>;
using List = std::unique_ptr<VLIBCSzList, FreeList>;

Hash make_hash(const std::vector<std::pair<std::string, std::string>>& entries = {});
List make_list();
std::vector<std::string> texts(const List& list);

}  // namespace support

#endif
