// Folders that are listed and examined ahead of the walk, by threads, and handed to it in the order
// of a walk by one thread.
//
// The contract between the two sides:
//
// - One consumer (the walk) asks for the entries of a folder one by one, and for those of each
//   subfolder when it comes to it: depth first, in the order in which the file system yields them.
// - Threads take the folder that comes next in that order and isn't taken yet; so what is looked at
//   together lies together. They only make system calls: no message, no platform call, no tally.
// - What is ahead of the consumer is at most kMostAhead entries. The folder that it waits for goes
//   on whatever is ahead, so that nobody waits for the other.
// - A folder is opened relative to its parent's handle, never through a link. When there are too
//   many handles (a folder of thousands of folders at every level), a parent's is given up and its
//   path opened anew below the top, through no link, and taken only if it is still that folder.
// - Threads take no signals, and the handler of SIGTERM needs no lock of theirs.
// - A folder whose file system is another than its parent's is left to the consumer to judge.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace vornreport {

struct Folder;

// One entry of a folder; neither "." nor "..", nor a folder of indexes ("@eaDir").
struct Entry {
  enum class Type : uint8_t { kFile, kFolder, kOther };

  const char* name;  // belongs to the folder
  Folder* folder;    // of a folder that could be looked at; belongs to its parent
  int64_t size, mtime, blocks;
  dev_t device;
  uid_t owner;
  uint32_t links;
  int error;  // errno of the look; ESTALE or ENOTDIR when it is no file or folder any more
  Type type;
};

// Some entries of a folder, in its order.
struct Batch {
  std::vector<Entry> entries;
  std::string names;
  std::vector<std::unique_ptr<Folder>> folders;
};

// A folder on its way from being found to having been walked.
struct Folder {
  enum class State : uint8_t {
    kFound,    // nobody has it yet
    kWorking,  // a thread is at it
    kPaused,   // listed in part, for want of room
    kForeign,  // on another file system than its parent: for the consumer to judge
    kListed,   // to its end, or to `error`
    kFailed    // couldn't be opened: `error`
  };

  Folder* parent = nullptr;  // null at the top
  const char* name = "";     // in the parent, whose batch holds it
  size_t path_length = 0;    // of the whole path, as the walk writes it
  dev_t device = 0;          // until it is open: of its parent
  ino_t inode = 0;           // once it is open

  State state = State::kFound;
  int error = 0;          // why it couldn't be opened, or not be read to its end
  int handle = -1;        // while it is being listed and has folders to open
  unsigned unopened = 0;  // folders in it that somebody is going to open
  unsigned openers = 0;   // those who use the handle just now

  std::vector<std::unique_ptr<Batch>> batches;  // that the consumer hasn't taken yet, few
  std::unique_ptr<Batch> current;               // the consumer's
  size_t next_entry = 0;                        // in it

  // In the order of the walk, all that aren't listed to their end.
  Folder* before = nullptr;
  Folder* after = nullptr;
};

class LookAhead {
 public:
  static constexpr size_t kMostAhead = 32768;  // entries, and
  static constexpr size_t kFolderCounts = 4;   // so many more for each folder among them
  static constexpr size_t kBatch = 4096;       // entries of one folder that are examined together
  static constexpr unsigned kMostHandles = 512;
  static constexpr size_t kLongestPath = 4095;

  // `threads`: 0 for as many as give speed (thread_count.hpp), or a fixed number.
  // `silence`: without a single look of any thread for so long, the file system has hung.
  LookAhead(unsigned threads, std::chrono::milliseconds silence);
  // Ends the threads. One that hangs in a file system is left behind.
  ~LookAhead();
  LookAhead(const LookAhead&) = delete;
  LookAhead& operator=(const LookAhead&) = delete;

  // The top folder, open; takes over the handle. `path_length`: of its path.
  Folder& begin(int handle, const struct stat& status, size_t path_length);

  // Waits until the folder is open, foreign or failed; then what it is.
  Folder::State await(Folder& folder);
  // The next entry of an open folder, waiting for it; null at its end, with `error` saying whether
  // it could be read that far. What an entry points to lives until the next call for its folder.
  const Entry* next(Folder& folder);

  // For the consumer to open a foreign folder: its parent's handle, or -1 with errno. Each is
  // followed by give_back(), then by adopt() when the folder was opened.
  int borrow_handle(Folder& parent);
  void give_back(Folder& parent, int handle);
  // The folder is open now, takes over the handle.
  void adopt(Folder& folder, int handle, const struct stat& status);

 private:
  class Shared;
  std::shared_ptr<Shared> shared_;  // with the threads, one of which may outlive this
};

}  // namespace vornreport
