#include "rep_quota_usage.hpp"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <memory>
#include <new>
#include <string_view>
#include <utility>

#include "shell.hpp"
#include "vorn/report.h"
#include "vorn/volume.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fleet_rows.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/rep_quota_usage";
// Generous: a million users on a slow directory service; but not for ever.
constexpr CommandLimits kToolLimits{.seconds = 600, .bytes = uint64_t{256} << 20};
constexpr size_t kLongestName = 127;
constexpr uint64_t kKiB = 1024;
constexpr int kMostExitStatus = 127;  // above it stands that of a command ended by a signal

unsigned long long print_u64(uint64_t value) {
  return value;
}

// --- The tool's output --------------------------------------------------------------------------

// A user line, split at runs of blanks: name, flags, used KiB, soft limit KiB; more follow.
enum Field { kName, kFlags, kUsed, kQuota };

struct UserLine {
  QuotaUser user{};
  int reached = kName;    // the field at which splitting ended
  bool complete = false;  // field kQuota was read and more follows it
};

// A field that holds the line's end, or running out of fields, ends the line early.
UserLine split_user_line(std::string_view line) {
  UserLine result;
  line = line.substr(0, line.find('\0'));
  for (int field = kName; field <= kQuota; ++field) {
    result.reached = field;
    line.remove_prefix(std::min(line.find_first_not_of(' '), line.size()));
    const std::string_view text = line.substr(0, line.find(' '));
    if (text.empty() || text.find('\n') != std::string_view::npos) {
      return result;
    }
    line.remove_prefix(text.size());
    if (field == kName) {
      result.user.name = text.substr(0, kLongestName);
    } else if (field == kUsed) {
      result.user.used = std::strtoull(std::string(text).c_str(), nullptr, 10);
    } else if (field == kQuota) {
      result.user.quota = std::strtoull(std::string(text).c_str(), nullptr, 10);
    }
  }
  result.complete = true;
  return result;
}

void add_user_line(const UserLine& line, QuotaVolume& volume, const char* path,
                   const VLIBCSzHash* user_hash) {
  const QuotaUser& user = line.user;
  const bool is_wanted = VLIBCSzHashGetValue(user_hash, user.name.c_str()) != nullptr;
  if (line.complete) {
    if (user.quota == 0) {
      volume.maxQuota = volume.totalKiB;
    } else if (user.quota > volume.maxQuota) {
      volume.maxQuota = user.quota;
    }
    if (is_wanted && user.used > volume.maxUserUsed) {
      volume.maxUserUsed = user.used;
    }
  }
  if (is_wanted) {
    QuotaUserInsert(volume.users, user);
    ++volume.filteredUsers;
    if (run_facts().may_tell(user.name)) {
      volume.tally.add(path, user.name, user.used * kKiB, user.quota * kKiB);
    }
  }
  report_trace(kModule, __LINE__, "('%s','%s',%llu, %llu)\n\n", path, user.name.c_str(),
               print_u64(user.used), print_u64(user.quota));
}

// The next line with its end, cut at 4095 bytes; any bytes may stand in it.
bool read_line(FILE* stream, std::string& line) {
  constexpr size_t kLongestLine = 4095;
  line.clear();
  int c = 0;
  while ((c = getc_unlocked(stream)) != EOF) {
    if (line.size() < kLongestLine) {
      line += static_cast<char>(c);
    }
    if (c == '\n') {
      break;
    }
  }
  return !line.empty();
}

// --- The page's blocks --------------------------------------------------------------------------

using VolumeId = std::array<char, 1024>;
using UserText = std::array<char, 1024>;

// A user of another server may have any name.
const char* user_text(const QuotaVolume& volume, const std::string& name, UserText& buffer) {
  if (volume.fleet_name.empty()) {
    return name.c_str();
  }
  return VornQazEscChar(name.c_str(), buffer.data(), buffer.size(), '\'') < 0 ? "" : buffer.data();
}

// Writes one block: an object with an entry for each volume.
template <typename WriteEntry>
void write_block(FILE* data, const QAZLLNode* list, const char* opening, const char* separator,
                 const char* closing, WriteEntry&& write_entry) {
  const char* before = opening;
  while (list != nullptr) {
    std::fputs(before, data);
    before = separator;
    VolumeId id{};
    const QuotaVolume& volume = *quota_volume_of(list);
    if (!volume.fleet_name.empty()) {
      if (VornQazEscChar(volume.fleet_name.c_str(), id.data(), id.size(), '\'') < 0) {
        id[0] = '\0';
      }
    } else if (VornQazVolumeGetId(volume.name.c_str(), id.data(), id.size()) < 0) {
      // The same volume again, without end: the platform has an identifier for every volume that
      // it enumerated.
      REPORT_LOG_ERR_NESTED(kModule, __LINE__, "cannot get volume id, volume=%s",
                            volume.name.c_str());
      continue;
    }
    write_entry(volume, id.data());
    list = list->next;
  }
  std::fputs(closing, data);
}

void write_raw_points(FILE* data, const QuotaVolume& volume) {
  std::fputs("\traw : [\n", data);
  int index = 0;
  for (const auto& [used, user] : volume.users) {
    if (index > 0) {
      std::fputs(",\n", data);
    }
    if (user.quota != 0) {
      report_trace(kModule, __LINE__, "user=%s, percent=%f\n", user.name.c_str(),
                   static_cast<double>(used) * 100.0 / static_cast<double>(volume.maxQuota));
    }
    // Without any usage this divides by zero, and the text of the result goes out as it comes.
    std::fprintf(data, "[[0, %d, %f]]", index,
                 static_cast<double>(used * 100) / static_cast<double>(volume.maxUserUsed));
    ++index;
  }
  std::fputs("\n],\n", data);
}

void write_data_entry(FILE* data, const QuotaVolume& volume, const char* id) {
  std::fprintf(data, "'%s' : {\n\tmaxQuota : '%llu',\n\tmaxUserUsed: %llu,\n\tdata: [],\n", id,
               print_u64(volume.maxQuota), print_u64(volume.maxUserUsed));
  report_trace(kModule, __LINE__, "volume=%s, maxQuota=%llu\n\n", volume.name.c_str(),
               print_u64(volume.maxQuota));
  write_raw_points(data, volume);
  std::fputs("\tlabels : [\n", data);
  const char* separator = "";
  for (const auto& [used, user] : volume.users) {
    UserText name{};
    std::fprintf(data, "%s\t\t'%s'\n", separator, user_text(volume, user.name, name));
    separator = "\t\t,\n";
  }
  std::fputs("\t]\n", data);
}

void write_table_entry(FILE* data, const QuotaVolume& volume, const char* id) {
  std::fprintf(data, "'%s' : [\n", id);
  const char* separator = "";
  for (const auto& [used, user] : volume.users) {
    const double percent = user.quota == 0 ? -1.0
                                           : static_cast<double>(static_cast<float>(used)) * 100.0 /
                                                 static_cast<double>(user.quota);
    UserText name{};
    std::fprintf(data, "%s['%s', %llu, %llu, %.1f]", separator, user_text(volume, user.name, name),
                 print_u64(user.quota * kKiB), print_u64(used * kKiB), percent);
    separator = ",\n";
  }
}

// --- The fleet ----------------------------------------------------------------------------------

void keep_for_fleet(const QuotaVolume& volume, const char* path) {
  for (const auto& [used, user] : volume.users) {
    keep_fleet_row(report_format::kQuotaUsage.name,
                   {path, std::to_string(volume.totalKiB), std::to_string(volume.maxQuota),
                    std::to_string(volume.maxUserUsed), std::to_string(volume.filteredUsers),
                    user.name, std::to_string(used), std::to_string(user.quota)});
  }
}

// Of each user on a volume the row of the newest run that tells of both: each profile has users of
// its own.
constexpr char kOverFleet[] =
    "select concat(server, ':', value[1]), value[2], value[3], value[4], value[5], value[6], "
    "value[7], value[8] from report_row where {runs} and report = 'quota_usage' and "
    "(server, value[1], value[6], run) global in (select server, value[1], value[6], max(run) "
    "from report_row where {runs} and report = 'quota_usage' group by server, value[1], value[6]) "
    "order by server, run desc, position";

// Null when the list has none of that name. Rows of one volume mostly follow each other.
QuotaVolume* fleet_volume(const QAZLLNode* list, std::string_view name) {
  if (list != nullptr && quota_volume_of(list->last)->fleet_name == name) {
    return quota_volume_of(list->last);
  }
  while (list != nullptr && quota_volume_of(list)->fleet_name != name) {
    list = list->next;
  }
  return list != nullptr ? quota_volume_of(list) : nullptr;
}

int add_fleet_user(void* context, int columns, char** values, char** /*names*/) noexcept {
  enum Column { kVolume, kTotal, kMaxQuota, kMaxUsed, kUsers, kUser, kUsedKiB, kQuotaKiB, kCount };
  if (columns != kCount ||
      std::any_of(values, values + kCount, [](const char* value) { return value == nullptr; })) {
    return -1;
  }
  const auto number = [&](Column column) { return std::strtoull(values[column], nullptr, 10); };
  auto& list = *static_cast<QAZLLNode**>(context);
  QuotaVolume* volume = fleet_volume(list, values[kVolume]);
  if (volume == nullptr) {
    std::unique_ptr<QuotaVolume> made(new (std::nothrow) QuotaVolume{});
    if (!made || QAZLLadd(&list, made.get(), nullptr) < 0) {
      return -1;
    }
    volume = made.release();
    volume->fleet_name = values[kVolume];
    volume->totalKiB = number(kTotal);
  }
  volume->maxQuota = std::max<uint64_t>(volume->maxQuota, number(kMaxQuota));
  volume->maxUserUsed = std::max<uint64_t>(volume->maxUserUsed, number(kMaxUsed));
  QuotaUserInsert(volume->users, QuotaUser{values[kUser], number(kUsedKiB), number(kQuotaKiB)});
  // Of two profiles' users nobody knows how many more are the same.
  volume->filteredUsers =
      std::max<uint64_t>({volume->filteredUsers, number(kUsers), volume->users.size()});
  return 0;
}

bool read_fleet(const FleetSource& fleet, QAZLLNode** list) {
  if (!run_over_fleet(fleet, kOverFleet, add_fleet_user, list, kModule)) {
    return false;
  }
  run_facts().quotas.emplace();  // whose users are filled from what the servers have found out
  RowCounts& rows = run_facts().rows[report_format::kQuotaUsage.name];
  for (const QAZLLNode* node = *list; node != nullptr; node = node->next) {
    rows.rows += quota_volume_of(node)->filteredUsers;
    rows.shown += quota_volume_of(node)->users.size();
  }
  return true;
}

// --- Running the tool ---------------------------------------------------------------------------

// Of a volume that has quotas.
void tell_failure(const char* volume) {
  record_incident(
      "quota_failed", volume,
      std::string("the quotas of ") + volume + " can't be read; run repquota on it to see why",
      AlreadyLogged::kYes);
}

void note_volume(QuotaVolume& volume) {
  RunFacts& facts = run_facts();
  RowCounts& rows = facts.rows[report_format::kQuotaUsage.name];
  rows.rows += volume.filteredUsers;
  rows.shown += volume.users.size();
  if (!facts.quotas) {
    facts.quotas.emplace();
  }
  facts.quotas->add(std::move(volume.tally));
}

void read_volume(const VORNMountVolInfo& record, QAZLLNode** list, const VLIBCSzHash* user_hash) {
  std::array<char, 8192> quoted{};
  if (VLIBCEncShParam(record.path, quoted.data(), quoted.size()) < 0 || is_unset(quoted.data())) {
    REPORT_LOG_ERR(kModule, __LINE__, "escape path failed, skip\n");
    return;
  }
  CommandText command;
  command.format("/sbin/repquota %s", quoted.data());
  // Twice: the first run only tells whether the volume has quotas.
  if (const int status = run_limited(kModule, command.c_str(), kToolLimits); status != 0) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "volume=%s get quota failed", record.path);
    // One that didn't get to its answer may have had some.
    if (status < 0 || status > kMostExitStatus || VORNVolumeHasQuotas(record.path) != 0) {
      tell_failure(record.path);
    }
    return;
  }
  report_trace(kModule, __LINE__, "run cmd=%s\n\n", command.c_str());
  FileHandle output = open_limited(kModule, command.c_str(), kToolLimits);
  if (!output) {
    REPORT_LOG_ERR(kModule, __LINE__, "run cmd failed, cmd=%s\n", command.c_str());
    tell_failure(record.path);
    return;
  }
  constexpr unsigned kKiBShift = 10;
  QAZLLNode* volume = nullptr;
  const int32_t reached = QuotaUsageParse(output.get(), &volume, record.path,
                                          record.total_size >> kKiBShift, user_hash);
  if (reached < 0) {
    REPORT_LOG_ERR(kModule, __LINE__, "parsing command failed\n");
  }
  // Half a table, of a tool that was ended at its limits or can't be read, is not shown as a whole
  // one.
  const bool was_read = std::ferror(output.get()) == 0;
  const bool is_whole = std::fclose(output.release()) == 0 && was_read;
  if (is_whole && volume != nullptr && QAZLLadd(list, volume->data, nullptr) == 0) {
    note_volume(*quota_volume_of(volume));
    keep_for_fleet(*quota_volume_of(volume), record.path);
    QAZLLfree(&volume, [](void* /*data*/) {});
  } else {
    QAZLLfree(&volume, QuotaFreeVolume);
    tell_failure(record.path);
  }
}

}  // namespace

void QuotaFreeVolume(void* volume) {
  delete static_cast<QuotaVolume*>(volume);
}

void QuotaUserInsert(QuotaUsers& users, QuotaUser user) {
  const uint64_t used = user.used;
  users.emplace(used, std::move(user));
  if (users.size() > kMostQuotaUsers) {
    users.erase(std::prev(users.end()));
  }
}

int32_t QuotaUsageParse(FILE* stream, QAZLLNode** list, const char* volumePath, uint64_t totalKiB,
                        const VLIBCSzHash* userHash) {
  if (stream == nullptr || list == nullptr || is_unset(volumePath) || userHash == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return -1;
  }
  std::unique_ptr<QuotaVolume> volume(new (std::nothrow) QuotaVolume{});
  if (!volume) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "malloc failed");
    return -1;
  }
  volume->name.format("%s", volumePath);
  volume->totalKiB = totalKiB;
  report_trace(kModule, __LINE__, "total size=%llu\n\n", print_u64(totalKiB));
  std::string line;
  bool in_table = false;
  int32_t reached = -1;
  while (read_line(stream, line)) {
    if (!in_table) {
      in_table = line.front() == '-';  // the line of dashes under the headings
      continue;
    }
    const UserLine user = split_user_line(line);
    reached = user.reached;
    if (user.reached == kQuota) {
      add_user_line(user, *volume, volumePath, userHash);
    }
  }
  if (QAZLLadd(list, volume.get(), nullptr) < 0) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "add to list failed");
    return -1;
  }
  static_cast<void>(volume.release());
  return reached;
}

int32_t QuotaUsageGetData(const char* profile, const VLIBCSzHash* profileHash, QAZLLNode** list,
                          const VLIBCSzHash* userHash) {
  if (is_unset(profile) || profileHash == nullptr || list == nullptr || userHash == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "Bad Parameter\n");
    return -1;
  }
  *list = nullptr;
  const VolumesHandle volumes(VORNMountVolAllEnum(nullptr, VORN_VOLUMES_OF_QUOTA));
  if (!volumes) {
    REPORT_LOG_ERR(kModule, __LINE__, "no mounted volume\n");
  }
  for (const VORNMountVolInfo* volume = volumes.get(); volume != nullptr; volume = volume->next) {
    if (!is_unset(volume->path)) {
      read_volume(*volume, list, userHash);
    }
  }
  if (*list == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "no data!!\n");
    return -1;
  }
  return 0;
}

int32_t QuotaUsageWrite(const char* profile, const VLIBCSzHash* profileHash, const QAZLLNode* list,
                        const VLIBCSzHash* userHash) {
  if (is_unset(profile) || profileHash == nullptr || list == nullptr || userHash == nullptr) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "bad parameter");
    return -1;
  }
  const PathText path = report_data_path();
  FileHandle data = open_report_file(path.c_str(), "a", kModule, __LINE__, LogForm::kSimple);
  if (!data) {
    return -1;
  }
  FILE* out = data.get();
  report_trace(kModule, __LINE__, "inject data\n");
  write_block(out, list, "<script type='text/javascript'>\nvar vornQuotaUsageData = {\n", "} , \n",
              "}}\n</script>\n", [out](const QuotaVolume& volume, const char* id) {
                write_data_entry(out, volume, id);
              });
  write_block(out, list, "<script type='text/javascript'>\nvar vornQuotaUsageTable = {\n", "] , \n",
              "]}\n</script>\n", [out](const QuotaVolume& volume, const char* id) {
                write_table_entry(out, volume, id);
              });
  return close_report_file(std::move(data), path.c_str(), kModule, __LINE__) ? 0 : -1;
}

int32_t quota_usage(ReportArgs* args) {
  if (args == nullptr || is_unset(args->profile) || args->profile_hash == nullptr ||
      args->user_hash == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "Bad Parameter\n");
    return -1;
  }
  report_trace(kModule, __LINE__, "run quota usage %s\n\n", args->profile);
  run_facts().quotas.emplace();
  run_facts().rows[report_format::kQuotaUsage.name] = {};
  QAZLLNode* list = nullptr;
  int32_t result = -1;
  if ((args->fleet != nullptr
           ? read_fleet(*args->fleet, &list)
           : QuotaUsageGetData(args->profile, args->profile_hash, &list, args->user_hash) == 0) &&
      list != nullptr) {
    result = QuotaUsageWrite(args->profile, args->profile_hash, list, args->user_hash);
  } else {
    REPORT_LOG_ERR(kModule, __LINE__, "QuotaUsageGetData failed, profile=%s\n", args->profile);
  }
  QAZLLfree(&list, QuotaFreeVolume);
  return result;
}

}  // namespace vornreport
