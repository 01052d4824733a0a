#include "content_groups.hpp"

#include <algorithm>
#include <array>
#include <cerrno>
#include <map>
#include <numeric>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "compare_limit.hpp"
#include "facts/duplicate_tally.hpp"
#include "facts/run_facts.hpp"
#include "module.hpp"
#include "report_frame.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

// Numbers that go on through the process.
int32_t g_data_group = 1;  // of the next group for the page
int32_t g_csv_group = 1;   // of the next group for the CSV file
uint64_t g_digested = 0;   // files for which a digest was about to be computed
uint64_t g_grouped = 0;    // files placed into groups

// What the report that is being made has found.
DuplicateTally g_tally(/*by_content=*/true);
RowCounts g_rows;
std::map<std::string, uint64_t> g_unread;  // files whose content can't be read, by share

void count_groups(const QAZLLNode* groups) {
  for (; groups != nullptr; groups = groups->next) {
    const dup_file_node& first = *file_of(groups);
    for (const dup_file_node* file = &first; file != nullptr; file = file->next) {
      g_tally.file(file->share_folder, file->path.c_str());
      ++g_rows.rows;
    }
    g_tally.end_group(first.size);
  }
}

// Users may move, replace or hold a file meanwhile, which is nothing to tell. What can't be read
// for another reason may have had a copy that the report lacks.
void count_unread(const QAZLLNode* candidates) {
  constexpr std::array kOfUsers{0, ENOENT, ENOTDIR, ELOOP, EXDEV, ESTALE, ENXIO, EWOULDBLOCK};
  for (; candidates != nullptr; candidates = candidates->next) {
    const dup_file_node& file = *file_of(candidates);
    if (file.failure.result != 0 &&
        std::find(kOfUsers.begin(), kOfUsers.end(), file.failure.error) == kOfUsers.end()) {
      ++g_unread[file.share];
    }
  }
}

// The candidates of a bucket, and for each the later ones with an equal sample, found by look-up:
// comparing every pair's samples would be a million millions for a million files.
class Bucket {
 public:
  explicit Bucket(const QAZLLNode* candidates) {
    for (const QAZLLNode* node = candidates; node != nullptr; node = node->next) {
      files_.push_back(file_of(node));
    }
    sorted_.resize(files_.size());
    std::iota(sorted_.begin(), sorted_.end(), uint32_t{0});
    place_.resize(files_.size());
    sort([](const dup_file_node& a, const dup_file_node& b) { return a.sample < b.sample; });
  }

  // Appends every group to `groups`, in the order of their first members.
  void find_groups(QAZLLNode** groups) {
    for (uint32_t first = 0; first < files_.size(); ++first) {
      if (files_[first]->grouped) {
        continue;
      }
      dup_file_node* chain = nullptr;
      if (!is_cut_short_) {
        gather_matches(first, chain);
      }
      if (is_cut_short_) {
        gather_digested(first, chain);
      }
      if (chain != nullptr && QAZLLadd(groups, chain, nullptr) < 0) {
        REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "add node failed");
      }
    }
  }

 private:
  // Sorts the places of all files; those of equal ones keep the list's order.
  template <typename Less>
  void sort(Less less) {
    std::stable_sort(sorted_.begin(), sorted_.end(),
                     [&](uint32_t a, uint32_t b) { return less(*files_[a], *files_[b]); });
    for (uint32_t place = 0; place < sorted_.size(); ++place) {
      place_[sorted_[place]] = place;
    }
  }

  // Puts the file and all later ones that match it before `chain`, the last match first.
  void gather_matches(uint32_t first, dup_file_node*& chain) {
    dup_file_node& a = *files_[first];
    for (size_t place = place_[first] + size_t{1}; place < sorted_.size(); ++place) {
      dup_file_node& b = *files_[sorted_[place]];
      if (b.sample != a.sample) {
        break;
      }
      if (b.grouped) {
        continue;
      }
      if (past_compare_limit(a.size)) {
        cut_short();
        break;
      }
      g_digested += (a.digest_done ? 0U : 1U) + (b.digest_done ? 0U : 1U);
      const int result = compare_files(a, b);
      if (result < 0 && past_compare_limit(a.size)) {
        cut_short();  // in the middle of a digest
        break;
      }
      if (result != 0) {
        report_trace(kDuplicateModule, __LINE__, "##### match(%llu/%llu), not match file=(%s,%s)\n",
                     static_cast<unsigned long long>(g_grouped),
                     static_cast<unsigned long long>(g_digested), a.path.c_str(), b.path.c_str());
        continue;
      }
      join(a, b, chain);
    }
  }

  // No pair is walked from now on: of those that have their digests, equal ones stand together.
  void cut_short() {
    is_cut_short_ = true;
    sort([](const dup_file_node& a, const dup_file_node& b) {
      return std::tie(a.sample, a.digest_done, a.md5) < std::tie(b.sample, b.digest_done, b.md5);
    });
  }

  // As gather_matches(), of what is known already.
  void gather_digested(uint32_t first, dup_file_node*& chain) {
    dup_file_node& a = *files_[first];
    for (size_t place = place_[first] + size_t{1}; a.digest_done && place < sorted_.size();
         ++place) {
      dup_file_node& b = *files_[sorted_[place]];
      if (b.sample != a.sample || !b.digest_done || b.md5 != a.md5) {
        break;
      }
      if (!b.grouped) {
        join(a, b, chain);
      }
    }
  }

  static void join(dup_file_node& a, dup_file_node& b, dup_file_node*& chain) {
    if (!a.grouped) {
      prepend(a, chain);
    }
    prepend(b, chain);
  }

  static void prepend(dup_file_node& file, dup_file_node*& chain) {
    ++g_grouped;
    file.grouped = true;
    file.next = chain;
    chain = &file;
  }

  std::vector<dup_file_node*> files_;  // in list order
  std::vector<uint32_t> sorted_;       // indices of files_, by sample; cut short, by digest, too
  std::vector<uint32_t> place_;        // of each file in sorted_
  bool is_cut_short_ = false;
};

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

void begin_content_groups(const VLIBCSzHash* profile_hash) {
  begin_compare_limit(profile_hash);
  g_tally = DuplicateTally(/*by_content=*/true);
  g_rows = {};
  g_unread.clear();
}

void end_content_groups() {
  end_compare_limit();
  run_facts().duplicates = g_tally.facts();
  run_facts().rows[report_format::kDuplicateFile.name] = g_rows;
  for (const auto& [share, count] : g_unread) {
    const std::string files = std::to_string(count);
    record_incident("share_part", share + ": " + files + " (contents)",
                    files + " files of share " + share +
                        " can't be read, so copies of them are missing from the report; the run's "
                        "output names them",
                    AlreadyLogged::kYes);
  }
}

int handle_size_bucket(const VLIBCSzHash* profile_hash, QAZLLNode** groups,
                       QAZLLNode** candidates) {
  if (profile_hash == nullptr || groups == nullptr || candidates == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    return -1;
  }
  int result = 0;
  if (*candidates != nullptr && !past_compare_limit(file_of(*candidates)->size)) {
    if (read_fast_digests(*candidates) < 0) {
      REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "fast digest list failed");
      result = -1;
    } else {
      Bucket(*candidates).find_groups(groups);
      if (*groups != nullptr) {
        count_groups(*groups);
        write_data_groups(*groups, kMostDataGroups, GroupsAre::kContinued);
        write_csv_groups(profile_hash, *groups, GroupsAre::kContinued);
      }
    }
  }
  count_unread(*candidates);
  release_bucket(groups, candidates);
  return result;
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
