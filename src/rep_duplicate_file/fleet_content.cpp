#include "fleet_content.hpp"

#include <array>
#include <string>

#include "content_groups.hpp"
#include "facts/duplicate_tally.hpp"
#include "facts/run_facts.hpp"
#include "module.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr char kStatement[] =
    "select concat(server, ':', share), path, size, mtime, "
    "concat(server, '/', profile, '/', toString(number)) from content_group where {runs} "
    "order by size desc, server, profile, number, position";
enum Column { kShare, kPath, kSize, kModifyTime, kGroup, kColumns };

// Collects a group, and writes it when the next one begins.
struct Groups {
  const VLIBCSzHash* profile_hash;
  std::string group{};
  QAZLLNode* members = nullptr;
  uint64_t rows = 0;
  uint64_t shown = 0;
  int next = 1;  // group of the page
  DuplicateTally tally{/*by_content=*/true};

  ~Groups() {
    QAZLLNode* none = nullptr;
    release_bucket(&none, &members);
  }

  void finish_group() {
    if (members == nullptr) {
      return;
    }
    uint64_t size = 0;
    for (QAZLLNode* node = members; node != nullptr; node = node->next) {
      dup_file_node& file = *file_of(node);
      file.next = node->next != nullptr ? file_of(node->next) : nullptr;
      size = file.size;
      tally.file(nullptr, (file.share + file.path).c_str());
      ++rows;
      shown += next <= kMostDataGroups ? 1 : 0;
    }
    ++next;
    tally.end_group(size);
    // The first member stands for the group.
    QAZLLNode group_node{file_of(members), nullptr, nullptr};
    write_data_groups(&group_node, kMostDataGroups, GroupsAre::kContinued);
    write_csv_groups(profile_hash, &group_node, GroupsAre::kContinued);
    QAZLLNode* none = nullptr;
    release_bucket(&none, &members);
  }
};

int add_member(void* context, int columns, char** values, char** /*names*/) noexcept {
  auto& groups = *static_cast<Groups*>(context);
  if (columns != kColumns || values[kGroup] == nullptr) {
    return -1;
  }
  if (groups.group != values[kGroup]) {
    groups.finish_group();
    groups.group = values[kGroup];
  }
  // Block and CSV file have the share's name as it is. Of a server's own it stays as it was.
  std::array<char, 1024> field{};
  std::array<char, 2048> share{};
  if (VornQazFormatCsvString(values[kShare] != nullptr ? values[kShare] : "", field.data(),
                             field.size()) < 0 ||
      VornQazEscChar(field.data(), share.data(), share.size(), '\'') < 0) {
    return -1;
  }
  values[kShare] = share.data();
  return add_candidate(&groups.members, values, 0, nullptr);
}

}  // namespace

int32_t report_fleet_content(const ReportArgs& args) {
  Groups groups{.profile_hash = args.profile_hash};
  {
    const PathText path = report_data_path();
    FileHandle data = open_report_file(path.c_str(), "a", kDuplicateModule, __LINE__);
    if (!data) {
      return -1;
    }
    VornQazImportSharePathHash(args.share_hash, data.get());
  }
  if (!run_over_fleet(*args.fleet, kStatement, add_member, &groups, kDuplicateModule)) {
    return -1;
  }
  groups.finish_group();
  write_data_groups(nullptr, kMostDataGroups, GroupsAre::kComplete);
  write_csv_groups(args.profile_hash, nullptr, GroupsAre::kComplete);
  run_facts().duplicates = groups.tally.facts();
  run_facts().rows[report_format::kDuplicateFile.name] = {groups.rows, groups.shown};
  return 0;
}

}  // namespace vornreport
