#include "look_ahead.hpp"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <system_error>
#include <thread>
#include <utility>

#include "folder_listing.hpp"
#include "signals_blocked.hpp"
#include "thread_count.hpp"

namespace vornreport {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kStretch{100};  // of the search for the number of threads
constexpr size_t kSmallBatch = 64;

}  // namespace

// What the consumer and the threads share. Everything is guarded by mutex_, but for what only one
// side touches: a folder's system calls are those of the thread that has taken it.
class LookAhead::Shared : public std::enable_shared_from_this<Shared> {
 public:
  Shared(unsigned threads, std::chrono::milliseconds silence)
      : fixed_count_(threads), silence_(silence) {}
  Shared(const Shared&) = delete;
  Shared& operator=(const Shared&) = delete;
  ~Shared() {
    if (top_) {
      close_all(*top_);
    }
  }

  Folder& begin(int handle, const struct stat& status, size_t path_length) {
    Lock lock(mutex_);
    top_ = std::make_unique<Folder>();
    top_->path_length = path_length;
    take_over(*top_, handle, status);
    start_threads();
    return *top_;
  }

  Folder::State await(Folder& folder) {
    Lock lock(mutex_);
    wait_for(folder, lock);
    switch (folder.state) {
      case Folder::State::kForeign:
      case Folder::State::kFailed:
        return folder.state;
      default:
        return Folder::State::kListed;
    }
  }

  const Entry* next(Folder& folder) {
    if (folder.current && folder.next_entry < folder.current->entries.size()) {
      return &folder.current->entries[folder.next_entry++];
    }
    std::unique_ptr<Batch> finished;  // freed without the lock
    Lock lock(mutex_);
    if (folder.current) {
      held_ -= room_of(*folder.current);
      finished = std::move(folder.current);
      if (is_silent_) {
        abandoned_.push_back(std::move(finished));  // a thread may be in one of its folders
      }
    }
    for (;;) {
      wait_for(folder, lock);
      if (folder.batches.empty()) {
        return nullptr;
      }
      const bool was_full = is_full();
      folder.current = std::move(folder.batches.front());
      folder.batches.erase(folder.batches.begin());
      ahead_ -= room_of(*folder.current);
      held_ += room_of(*folder.current);
      if (was_full && !is_full()) {
        work_.notify_all();
      }
      if (!folder.current->entries.empty()) {
        folder.next_entry = 1;
        return folder.current->entries.data();
      }
      folder.current.reset();
    }
  }

  int borrow_handle(Folder& parent) {
    Lock lock(mutex_);
    if (parent.handle < 0) {
      return open_again(parent);
    }
    ++parent.openers;
    return parent.handle;
  }

  void give_back(Folder& parent, int handle) {
    Lock lock(mutex_);
    opened_one(parent, handle);
  }

  void adopt(Folder& folder, int handle, const struct stat& status) {
    Lock lock(mutex_);
    take_over(folder, handle, status);
    work_.notify_one();
  }

  // False when a thread hangs.
  bool stop() {
    Lock lock(mutex_);
    is_stopping_ = true;
    work_.notify_all();
    rest_.notify_all();
    return ended_.wait_for(lock, is_silent_ ? std::chrono::milliseconds(0) : silence_,
                           [this] { return alive_ == 0; });
  }

 private:
  using Lock = std::unique_lock<std::mutex>;

  // --- Folders in the order of the walk, all that aren't listed to their end
  // ----------------------

  void insert_before(Folder& folder, Folder* next) {
    folder.after = next;
    folder.before = next != nullptr ? next->before : nullptr;
    (folder.before != nullptr ? folder.before->after : first_) = &folder;
    if (next != nullptr) {
      next->before = &folder;
    }
  }

  void remove(Folder& folder) {
    (folder.before != nullptr ? folder.before->after : first_) = folder.after;
    if (folder.after != nullptr) {
      folder.after->before = folder.before;
    }
    folder.before = folder.after = nullptr;
  }

  // An open folder that the consumer is at, so that it comes before all others.
  void take_over(Folder& folder, int handle, const struct stat& status) {
    folder.handle = handle;
    folder.device = status.st_dev;
    folder.inode = status.st_ino;
    folder.state = Folder::State::kPaused;
    ++handles_;
    insert_before(folder, first_);
  }

  // The first one that nobody is at, if there is room for what it holds.
  Folder* pick() const {
    for (Folder* folder = first_; folder != nullptr; folder = folder->after) {
      if (folder->state == Folder::State::kFound || folder->state == Folder::State::kPaused) {
        return !is_full() || folder == wanted_ ? folder : nullptr;
      }
    }
    return nullptr;
  }

  bool is_full() const { return ahead_ >= kMostAhead; }

  static size_t room_of(const Batch& batch) {
    return batch.entries.size() + kFolderCounts * batch.folders.size();
  }

  // --- Handles
  // ------------------------------------------------------------------------------------

  void close_handle(Folder& folder) {
    if (folder.handle >= 0) {
      close(folder.handle);
      folder.handle = -1;
      --handles_;
    }
  }

  // The top's stays, since others are opened anew below it.
  void close_when_done(Folder& folder) {
    const bool is_listed = folder.state == Folder::State::kListed;
    const bool is_needed = folder.unopened > 0 && handles_ <= kMostHandles;
    if (is_listed && !is_needed && folder.openers == 0 && folder.parent != nullptr) {
      close_handle(folder);
    }
  }

  // Somebody has tried to open a folder of `parent`'s with `handle`, which is its own or one that
  // was opened anew.
  void opened_one(Folder& parent, int handle) {
    if (handle == parent.handle) {
      --parent.openers;
    } else if (handle >= 0) {
      close(handle);
    }
    --parent.unopened;
    close_when_done(parent);
  }

  static void close_all(const Folder& folder) {
    if (folder.handle >= 0) {
      close(folder.handle);
    }
    for (const std::unique_ptr<Batch>& batch : folder.batches) {
      for (const std::unique_ptr<Folder>& inner : batch->folders) {
        close_all(*inner);
      }
    }
    if (folder.current) {
      for (const std::unique_ptr<Folder>& inner : folder.current->folders) {
        close_all(*inner);
      }
    }
  }

  // --- The consumer
  // -------------------------------------------------------------------------------

  static bool has_news(const Folder& folder) {
    return !folder.batches.empty() || folder.state == Folder::State::kListed ||
           folder.state == Folder::State::kFailed || folder.state == Folder::State::kForeign;
  }

  void wait_for(Folder& folder, Lock& lock) {
    while (!has_news(folder)) {
      if (is_silent_) {
        folder.state = Folder::State::kFailed;
        folder.error = ETIMEDOUT;
        break;
      }
      wanted_ = &folder;
      if (alive_ == 0) {  // no thread could be started
        serve(*pick(), lock);
        continue;
      }
      work_.notify_one();
      const uint64_t looks = all_looks_;
      if (ready_.wait_for(lock, silence_) == std::cv_status::timeout && looks == all_looks_ &&
          !has_news(folder)) {
        is_silent_ = true;
      }
    }
    wanted_ = nullptr;
  }

  // --- The threads
  // --------------------------------------------------------------------------------

  unsigned wanted_threads() const { return fixed_count_ != 0 ? fixed_count_ : count_.count(); }

  // Those that there are meanwhile serve as well.
  void start_threads() {
    const SignalsBlocked blocked;
    for (; started_ < wanted_threads(); ++started_) {
      try {
        std::thread([shared = shared_from_this(), index = started_] {
          shared->work(index);
        }).detach();
        ++alive_;
      } catch (const std::system_error&) {
        return;
      }
    }
  }

  void work(unsigned index) {
    Lock lock(mutex_);
    while (!is_stopping_) {
      if (index >= wanted_threads()) {
        work_.notify_one();  // what woke this one up may have been for another
        rest_.wait(lock);
      } else if (Folder* folder = pick(); folder != nullptr) {
        serve(*folder, lock);
      } else {
        work_.wait(lock);
      }
    }
    --alive_;
    ended_.notify_all();
  }

  // Opens a folder, or lists the next part of one.
  void serve(Folder& folder, Lock& lock) {
    const bool is_open = folder.handle >= 0;
    folder.state = Folder::State::kWorking;
    if (!is_open && !open(folder, lock)) {
      remove(folder);
      ready_.notify_one();
      return;
    }
    const size_t most = held_ > kMostAhead ? kSmallBatch : kBatch;
    auto batch = std::make_unique<Batch>();
    lock.unlock();
    const Listed listed = list_batch(folder, most, *batch);
    lock.lock();
    take_in(folder, listed, std::move(batch));
    ready_.notify_one();
  }

  // False when it is not to be listed; its state says why.
  bool open(Folder& folder, Lock& lock) {
    Folder& parent = *folder.parent;
    const int known = parent.handle;
    parent.openers += known >= 0 ? 1 : 0;
    lock.unlock();
    const int from = known >= 0 ? known : open_again(parent);
    const int handle = from >= 0 ? open_folder_at(from, folder.name) : -1;
    const int error = errno;
    struct stat status {};
    const bool is_same_system =
        handle >= 0 && fstat(handle, &status) == 0 && status.st_dev == parent.device;
    if (handle >= 0 && !is_same_system) {
      close(handle);
    }
    lock.lock();
    if (handle >= 0 && !is_same_system) {
      // Replaced between the look and the open. The consumer opens it, so it still counts.
      folder.state = Folder::State::kForeign;
      ++parent.unopened;
    } else if (handle < 0) {
      folder.state = Folder::State::kFailed;
      folder.error = error;
    } else {
      folder.handle = handle;
      folder.inode = status.st_ino;
      ++handles_;
    }
    opened_one(parent, from);
    return folder.state == Folder::State::kWorking;
  }

  void take_in(Folder& folder, const Listed& listed, std::unique_ptr<Batch> batch) {
    ahead_ += room_of(*batch);
    count_looks(batch->entries.size() + 1);
    bool has_work = !listed.at_end;
    for (const std::unique_ptr<Folder>& found : batch->folders) {
      ++folder.unopened;
      if (found->state == Folder::State::kFound) {
        insert_before(*found, &folder);
        has_work = true;
      }
    }
    folder.batches.push_back(std::move(batch));
    folder.state = Folder::State::kPaused;
    if (listed.at_end) {
      folder.state = Folder::State::kListed;
      folder.error = listed.error;
      remove(folder);
      close_when_done(folder);
    }
    if (has_work) {
      work_.notify_all();
    }
  }

  void count_looks(size_t looks) {
    all_looks_ += looks;
    const Clock::time_point now = Clock::now();
    const std::chrono::duration<double> time = now - stretch_begin_;
    if (fixed_count_ != 0 || time < kStretch) {
      return;
    }
    const auto done = static_cast<double>(all_looks_ - stretch_looks_);
    count_.end_stretch(done / time.count(), ahead_ >= kMostAhead / 2);
    stretch_begin_ = now;
    stretch_looks_ = all_looks_;
    start_threads();
    rest_.notify_all();
  }

  std::mutex mutex_;
  std::condition_variable work_;   // a folder to serve, or room for what it holds
  std::condition_variable rest_;   // for threads beyond those wanted
  std::condition_variable ready_;  // for the consumer
  std::condition_variable ended_;
  std::unique_ptr<Folder> top_;
  Folder* first_ = nullptr;   // in the order of the walk
  Folder* wanted_ = nullptr;  // that the consumer waits for
  size_t ahead_ = 0;          // room of the entries that the consumer hasn't taken
  size_t held_ = 0;           // room of the batches that it is at
  unsigned handles_ = 0;
  bool is_stopping_ = false;
  bool is_silent_ = false;  // a thread hangs
  std::vector<std::unique_ptr<Batch>> abandoned_;

  const unsigned fixed_count_;
  const std::chrono::milliseconds silence_;
  ThreadCount count_;
  unsigned started_ = 0, alive_ = 0;
  uint64_t all_looks_ = 0, stretch_looks_ = 0;
  Clock::time_point stretch_begin_ = Clock::now();
};

LookAhead::LookAhead(unsigned threads, std::chrono::milliseconds silence)
    : shared_(std::make_shared<Shared>(threads, silence)) {}

LookAhead::~LookAhead() {
  shared_->stop();
}

Folder& LookAhead::begin(int handle, const struct stat& status, size_t path_length) {
  return shared_->begin(handle, status, path_length);
}

Folder::State LookAhead::await(Folder& folder) {
  return shared_->await(folder);
}

const Entry* LookAhead::next(Folder& folder) {
  return shared_->next(folder);
}

int LookAhead::borrow_handle(Folder& parent) {
  return shared_->borrow_handle(parent);
}

void LookAhead::give_back(Folder& parent, int handle) {
  shared_->give_back(parent, handle);
}

void LookAhead::adopt(Folder& folder, int handle, const struct stat& status) {
  shared_->adopt(folder, handle, status);
}

}  // namespace vornreport
