#include "content_groups.hpp"

#include <algorithm>
#include <array>
#include <cerrno>
#include <list>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "bucket.hpp"
#include "compare_limit.hpp"
#include "facts/duplicate_tally.hpp"
#include "facts/run_facts.hpp"
#include "module.hpp"
#include "readers.hpp"
#include "report_frame.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/fleet_rows.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

// Numbers that go on through the process.
int32_t g_data_group = 1;  // of the next group for the page
int32_t g_csv_group = 1;   // of the next group for the CSV file

// What the report that is being made has found.
DuplicateTally g_tally(/*by_content=*/true);
RowCounts g_rows;
std::map<std::string, uint64_t> g_unread;  // files whose content can't be read, by share

void count_groups(const QAZLLNode* groups) {
  for (; groups != nullptr; groups = groups->next) {
    const uint64_t size = file_of(groups)->size;
    for (const dup_file_node* file = file_of(groups); file != nullptr; file = file->next) {
      keep_content_member(file == file_of(groups), file->share, file->path.c_str(), file->size,
                          file->mtime);
      g_tally.file(file->share_folder, file->path.c_str());
      ++g_rows.rows;
    }
    g_tally.end_group(size);
  }
}

// Users may move, replace or hold a file meanwhile, which is nothing to tell. What can't be read
// for another reason may have had a copy that the report lacks.
void count_unread(const Bucket& bucket) {
  constexpr std::array kOfUsers{0, ENOENT, ENOTDIR, ELOOP, EXDEV, ESTALE, ENXIO, EWOULDBLOCK};
  for (const dup_file_node* file : bucket.files()) {
    if (file->failure.result != 0 &&
        std::find(kOfUsers.begin(), kOfUsers.end(), file->failure.error) == kOfUsers.end()) {
      ++g_unread[file->share];
    }
  }
}

// Buckets are kept until there are enough of them to be read ahead together: most are small.
constexpr size_t kEnoughFiles = 4096;
constexpr uint64_t kEnoughWork = uint64_t{64} << 20U;  // bytes
constexpr uint64_t kWorthThreads = uint64_t{1} << 20U;

std::optional<Readers> g_readers;  // while a report is made

class WaitingBuckets {
 public:
  void add(QAZLLNode* candidates) {
    const Bucket& bucket = buckets_.emplace_back(candidates);
    const uint64_t count = bucket.files().size();
    const uint64_t cost = std::min(bucket.file_size(), kEnoughWork) + Readers::kFileCost;
    files_ += count;
    work_ += bucket.file_size() == 0 ? 0 : count * cost;
  }

  bool are_enough() const { return files_ >= kEnoughFiles || work_ >= kEnoughWork; }

  void clear() {
    buckets_.clear();
    files_ = 0;
    work_ = 0;
  }

  // In their order. 0, or -1 (logged) when one's samples could not be read.
  int handle(const VLIBCSzHash* profile_hash, QAZLLNode** groups) {
    int result = 0;
    if (!buckets_.empty() && !past_compare_limit(buckets_.front().file_size())) {
      if (g_readers && work_ >= kWorthThreads) {
        read_ahead(*g_readers);
      }
      for (Bucket& bucket : buckets_) {
        result = std::min(result, find_groups(groups, bucket));
      }
      if (*groups != nullptr) {
        count_groups(*groups);
        write_data_groups(*groups, kMostDataGroups, GroupsAre::kContinued);
        write_csv_groups(profile_hash, *groups, GroupsAre::kContinued);
      }
      for (Bucket& bucket : buckets_) {
        count_unread(bucket);
        bucket.release(groups);
      }
    }
    clear();
    return result;
  }

 private:
  void read_ahead(Readers& readers) {
    std::vector<dup_file_node*> files;
    const auto before_deadline = [&](void (*step)(dup_file_node&)) {
      return [&files, step](size_t i) {
        if (VornQazDigestDeadlinePassed() == 0) {
          step(*files[i]);
        }
      };
    };
    for (const Bucket& bucket : buckets_) {
      if (bucket.file_size() != 0) {
        files.insert(files.end(), bucket.files().begin(), bucket.files().end());
      }
    }
    readers.for_each(Readers::Kind::kSamples, files.size(), before_deadline(&read_sample_ahead));
    files.clear();
    for (Bucket& bucket : buckets_) {
      if (bucket.file_size() != 0) {
        bucket.add_compared(files);
      }
    }
    readers.for_each(Readers::Kind::kDigests, files.size(), before_deadline(&compute_digest_ahead));
  }

  static int find_groups(QAZLLNode** groups, Bucket& bucket) {
    if (bucket.read_samples() < 0) {
      REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "fast digest list failed");
      return -1;
    }
    bucket.find_groups(groups);
    return 0;
  }

  std::list<Bucket> buckets_;  // a global one: a deque would allocate before main
  size_t files_ = 0;
  uint64_t work_ = 0;  // bytes, at most, to be read of them
};
WaitingBuckets g_waiting;

void write_data_member(FILE* data, const dup_file_node& file, bool is_first) {
  static std::array<char, 4096> path;
  std::fputs(is_first ? "<script type='text/javascript'>\nvar vornDuplicateHashMatch = 1;\nvar "
                        "vornDuplicateFileData = [\n"
                      : ",\n",
             data);
  if (VornQazEscChar(file.path.c_str(), path.data(), path.size(), '\'') < 0) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "escape file failed, file=%s",
                          file.path.c_str());
    return;
  }
  std::fprintf(data, "[ '%d', '%s', '%s', %llu, %d ]", g_data_group, file.share, path.data(),
               static_cast<unsigned long long>(file.size), file.mtime);
}

void write_csv_member(FILE* csv, const dup_file_node& file) {
  static std::array<char, 8192> field;
  const std::string seconds = std::to_string(file.mtime);
  std::array<char, 128> time{};
  const bool has_time =
      VornQazTimeConvert(seconds.c_str(), time.data(), time.size()) >= 0 && time[0] != '\0';
  const bool has_field = VornQazFormatCsvString(file.path.c_str(), field.data(), field.size()) >= 0;
  std::fprintf(csv, "%d\t%s\t%s\t%llu\t%s\n", g_csv_group, file.share,
               has_field ? field.data() : file.path.c_str(),
               static_cast<unsigned long long>(file.size),
               has_time ? time.data() : seconds.c_str());
}

}  // namespace

void begin_content_groups(const VLIBCSzHash* profile_hash, unsigned threads) {
  abandon_content_groups();
  begin_compare_limit(profile_hash);
  g_readers.emplace(threads);
  g_tally = DuplicateTally(/*by_content=*/true);
  g_rows = {};
  g_unread.clear();
}

void end_content_groups() {
  abandon_content_groups();
  run_facts().duplicates = g_tally.facts();
  run_facts().rows[report_format::kDuplicateFile.name] = g_rows;
  for (const auto& [share, count] : g_unread) {
    std::string what = share;
    what.append(": ").append(std::to_string(count)).append(" (contents)");
    std::string text = std::to_string(count);
    text.append(" files of share ")
        .append(share)
        .append(
            " can't be read, so copies of them are missing from the report; the run's output "
            "names them");
    record_incident("share_part", what, text, AlreadyLogged::kYes);
  }
}

void abandon_content_groups() {
  g_waiting.clear();
  g_readers.reset();
  end_compare_limit();
}

int handle_size_bucket(const VLIBCSzHash* profile_hash, QAZLLNode** groups, QAZLLNode** candidates,
                       GroupsAre groups_are) {
  if (profile_hash == nullptr || groups == nullptr || candidates == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    return -1;
  }
  if (*candidates != nullptr) {
    g_waiting.add(std::exchange(*candidates, nullptr));
  }
  if (groups_are == GroupsAre::kContinued && g_readers && !g_waiting.are_enough()) {
    return 0;
  }
  return g_waiting.handle(profile_hash, groups);
}

int write_data_groups(const QAZLLNode* groups, int limit, GroupsAre close) {
  const PathText path = report_data_path();
  FileHandle data = open_report_file(path.c_str(), "a", kDuplicateModule, __LINE__);
  if (!data) {
    return -1;
  }
  int result = -1;
  if (groups == nullptr || limit < 0) {
    if (close == GroupsAre::kContinued) {
      REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    }
  } else {
    for (; groups != nullptr && g_data_group <= limit; groups = groups->next, ++g_data_group) {
      const dup_file_node* first = file_of(groups);
      for (const dup_file_node* file = first; file != nullptr; file = file->next) {
        write_data_member(data.get(), *file, g_data_group == 1 && file == first);
        ++g_rows.shown;
      }
    }
    result = g_data_group;
  }
  if (close == GroupsAre::kComplete) {
    std::fputs(g_data_group > 1 ? "\n];\n</script>\n" : "</script>\n", data.get());
  }
  return close_report_file(std::move(data), path.c_str(), kDuplicateModule, __LINE__) ? result : -1;
}

int write_csv_groups(const VLIBCSzHash* profile_hash, const QAZLLNode* groups, GroupsAre close) {
  const char* csv_dir =
      profile_hash != nullptr ? set_value(profile_hash, "real_path_csv") : nullptr;
  PathText path;
  FileHandle csv;
  int result = -1;
  if (csv_dir == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "get csv dir failed");
  } else {
    path.format("%s/%s.csv", csv_dir, report_format::kDuplicateFile.name);
    csv = open_report_file(path.c_str(), "a", kDuplicateModule, __LINE__, LogForm::kSimple,
                           Costs::kReport);
  }
  const bool opened = csv != nullptr;
  if (csv && groups == nullptr) {
    if (close == GroupsAre::kContinued) {
      REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
      return -1;
    }
  } else if (csv) {
    if (g_csv_group == 1) {
      std::fputs("Duplicate Group\tShare\tFile\tSize(Byte)\tModify Time\n", csv.get());
    }
    for (; groups != nullptr; groups = groups->next, ++g_csv_group) {
      for (const dup_file_node* file = file_of(groups); file != nullptr; file = file->next) {
        write_csv_member(csv.get(), *file);
      }
    }
    result = 0;
  }
  const bool kept =
      close_report_file(std::move(csv), path.c_str(), kDuplicateModule, __LINE__, Costs::kReport);
  if (!kept || !opened) {
    tell_failed_report(report_format::kDuplicateFile.name);
  }
  if (!kept) {
    return -1;
  }
  if (close == GroupsAre::kComplete && g_csv_group > 1) {
    finish_csv(report_format::kDuplicateFile, path.c_str());
  }
  return result;
}

}  // namespace vornreport
