#include "rep_volume_usage.hpp"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <string_view>
#include <utility>

#include "facts/run_facts.hpp"
#include "report_format/reports.hpp"
#include "report_format/values.hpp"
#include "report_frame.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fleet_rows.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/rep_volume_usage";
using VolumeId = std::array<char, 1024>;

// Owns the list head of one call.
struct VolumeList {
  QAZLLNode* head = nullptr;
  VolumeList() = default;
  ~VolumeList() { QAZLLfree(&head, VolumeUsageFreeNode); }
  VolumeList(const VolumeList&) = delete;
  VolumeList& operator=(const VolumeList&) = delete;
};

// Two elements are always told apart, so a list appends.
int keep_order(const void* listed, const void* added) {
  if (listed == nullptr || added == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "Bad parameter\n");
    return 0;
  }
  return 1;
}

void fill_state(const VORNMountVolInfo& volume, VolumeUsageSample& sample) {
  const unsigned long long used = volume.total_size - volume.free_size;
  sample.sizeUse.format("%llu", used);
  sample.sizeFree.format("%llu", volume.free_size);
  // A volume of size 0 divides by zero; the text of the result is stored as it comes.
  sample.percent.format("%f",
                        static_cast<double>(used) * 100.0 / static_cast<double>(volume.total_size));
}

// False, logged, when the volume has no identifier and is left out.
bool volume_id(const VolumeUsageNode& node, VolumeId& id) {
  if (!node.fleet_name.empty()) {
    // One that is no longer mounted has none.
    return !node.fleet_name.ends_with(':') &&
           VornQazEscChar(node.fleet_name.c_str(), id.data(), id.size(), '\'') >= 0;
  }
  if (VornQazVolumeGetId(node.name.c_str(), id.data(), id.size()) >= 0) {
    return true;
  }
  REPORT_LOG_ERR(kModule, __LINE__, "get volume id failed, volume=%s\n", node.name.c_str());
  return false;
}

bool writer_args_are_set(const char* profile, const VLIBCSzHash* profile_hash,
                         const QAZLLNode* list) {
  if (is_unset(profile) || profile_hash == nullptr || list == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return false;
  }
  return true;
}

void write_current_row(FILE* data, const VolumeUsageNode& node, const VolumeId& id) {
  const VolumeUsageSample& now = *node.samples;
  const std::string days = node.days == -1 ? "-" : std::to_string(node.days);
  std::fprintf(data, "[ '%s', %s , %s, '%s%%', '%s' ]", id.data(), now.sizeUse.c_str(),
               now.sizeFree.c_str(), now.percent.c_str(), days.c_str());
}

void write_history_series(FILE* data, const VolumeUsageNode& node, const VolumeId& id) {
  std::fprintf(data, "'%s' : [\n", id.data());
  const char* separator = "";
  for (const VolumeUsageSample* sample = node.samples; sample != nullptr; sample = sample->next) {
    std::fprintf(data, "%s[ '%s', %s ]", separator, sample->sampleDate.c_str(),
                 sample->percent.c_str());
    separator = ",\n";
  }
  std::fputs("\n]", data);
}

// Appends one block over all volumes that have an identifier: `opening` before the first, `closing`
// after the last; nothing when there is none. Their number, or -1.
using WriteVolume = void (*)(FILE* data, const VolumeUsageNode& node, const VolumeId& id);
int32_t write_block(const QAZLLNode* list, const char* opening, WriteVolume write_volume,
                    const char* closing) {
  const PathText path = report_data_path();
  FileHandle data = open_report_file(path.c_str(), "a", kModule, __LINE__, LogForm::kSimple);
  if (!data) {
    return -1;
  }
  int32_t count = 0;
  for (; list != nullptr; list = list->next) {
    const VolumeUsageNode* node = volume_of(list);
    VolumeId id{};
    if (node == nullptr || node->samples == nullptr || !volume_id(*node, id)) {
      continue;
    }
    std::fputs(count == 0 ? opening : ",\n", data.get());
    write_volume(data.get(), *node, id);
    ++count;
  }
  if (count > 0) {
    std::fputs(closing, data.get());
  }
  return close_report_file(std::move(data), path.c_str(), kModule, __LINE__) ? count : -1;
}

// Whether the line of a CSV file ends, or falls into other fields, at a character of `text`.
bool breaks_csv(std::string_view text) {
  return std::any_of(text.begin(), text.end(), [](char c) {
    return static_cast<unsigned char>(c) < ' ' || c == '\x7f' || c == '"';
  });
}

void write_csv_row(FILE* csv, const VolumeUsageNode& node) {
  VolumeId id{};
  const char* name = node.name.c_str();
  if (!node.fleet_name.empty()) {
    if (VornQazFormatCsvString(node.fleet_name.c_str(), id.data(), id.size()) < 0) {
      return;
    }
    name = id.data();
  } else if (breaks_csv(name)) {
    if (!volume_id(node, id)) {
      return;
    }
    name = id.data();  // as the page calls it
  }
  const VolumeUsageSample& now = *node.samples;
  const unsigned long long size = std::strtoull(now.sizeUse.c_str(), nullptr, 10) +
                                  std::strtoull(now.sizeFree.c_str(), nullptr, 10);
  const std::string days = node.days == -1 ? "-" : std::to_string(node.days);
  std::fprintf(csv, "\"%s\", \"%llu\" ,\"%s%%\", \"%s\"\n", name, size, now.percent.c_str(),
               days.c_str());
}

// What the fleet gets of a volume: its row, and the samples behind the current one.
void keep_for_fleet(const QAZLLNode* list) {
  for (; keeps_fleet_rows() && list != nullptr; list = list->next) {
    const VolumeUsageNode& node = *volume_of(list);
    if (node.samples == nullptr) {
      continue;
    }
    for (const VolumeUsageSample* sample = node.samples; sample != nullptr; sample = sample->next) {
      keep_fleet_row(report_format::kVolumeUsage.name,
                     {node.path, std::to_string(node.days), sample->sampleDate.c_str(),
                      sample->sizeUse.c_str(), sample->sizeFree.c_str(), sample->percent.c_str()});
    }
  }
}

// Of each volume the rows of the newest run that tells of it, whichever profile's. A volume's first
// is the current one.
constexpr char kOverFleet[] =
    "select concat(server, ':', value[1]), value[2], value[3], value[4], value[5], value[6] "
    "from report_row where {runs} and report = 'volume_usage' and (server, value[1], run) global "
    "in "
    "(select server, value[1], max(run) from report_row where {runs} and report = 'volume_usage' "
    "group by server, value[1]) order by server, run desc, position";

int add_fleet_sample(void* context, int columns, char** values, char** /*names*/) noexcept {
  enum Column { kVolume, kDays, kDate, kUsed, kFree, kPercent, kCount };
  if (columns != kCount ||
      std::any_of(values, values + kCount, [](const char* value) { return value == nullptr; })) {
    return -1;
  }
  // They go into the page as they are. The percentage of a volume of size 0 is -nan.
  if (std::any_of(values + kDays, values + kCount, [](const char* value) {
        return value[std::strspn(value, "0123456789.-+einfa")] != '\0';
      })) {
    REPORT_LOG_ERR(kModule, __LINE__, "the samples of volume %s aren't numbers\n", values[kVolume]);
    return -1;
  }
  auto& list = *static_cast<QAZLLNode**>(context);
  std::unique_ptr<VolumeUsageSample> sample(new (std::nothrow) VolumeUsageSample{});
  if (!sample) {
    return -1;
  }
  sample->sampleDate.format("%s", values[kDate]);
  sample->sizeUse.format("%s", values[kUsed]);
  sample->sizeFree.format("%s", values[kFree]);
  sample->percent.format("%s", values[kPercent]);
  // The samples of those that are no longer mounted have no name to tell them apart by.
  const std::string_view name = values[kVolume];
  if (list != nullptr && !name.ends_with(':') && volume_of(list->last)->fleet_name == name) {
    VolumeUsageSample* end = volume_of(list->last)->samples;
    while (end->next != nullptr) {
      end = end->next;
    }
    end->next = sample.release();
    return 0;
  }
  std::unique_ptr<VolumeUsageNode> node(new (std::nothrow) VolumeUsageNode{});
  if (!node || QAZLLadd(&list, node.get(), keep_order) < 0) {
    return -1;
  }
  node->fleet_name = name;
  node->days = static_cast<int32_t>(std::strtol(values[kDays], nullptr, 10));
  node->samples = sample.release();
  static_cast<void>(node.release());
  return 0;
}

bool wants_history(const VLIBCSzHash* profile_hash) {
  const char* value = VLIBCSzHashGetValue(profile_hash, "volume_history");
  return value != nullptr && report_format::is_true(value);
}

}  // namespace

int32_t VolumeUsageAddVolume(const VORNMountVolInfo* volumeRecord, QAZLLNode** list) {
  if (volumeRecord == nullptr || list == nullptr || is_unset(volumeRecord->path)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Bad parameter\n");
    return -1;
  }
  std::unique_ptr<VolumeUsageSample> sample(new (std::nothrow) VolumeUsageSample{});
  std::unique_ptr<VolumeUsageNode> node(new (std::nothrow) VolumeUsageNode{});
  if (!sample || !node) {
    REPORT_LOG_ERR(kModule, __LINE__, "memory allocate failed\n");
    return -1;
  }
  if (VornQazGetTimeSecond(sample->sampleDate.data(), decltype(sample->sampleDate)::size()) < 0) {
    REPORT_LOG_ERR(kModule, __LINE__, "get time string failed\n");
    return -1;
  }
  fill_state(*volumeRecord, *sample);
  node->name.format("%s", volumeRecord->path);
  node->path = volumeRecord->path;
  node->samples = sample.get();
  if (QAZLLadd(list, node.get(), keep_order) < 0) {
    REPORT_LOG_ERR(kModule, __LINE__, "add list failed");
    return -1;
  }
  static_cast<void>(sample.release());
  static_cast<void>(node.release());
  return 0;
}

int32_t VolumeUsageEnumVolumes(QAZLLNode** list) {
  const VolumesHandle volumes(VORNMountVolAllEnum(nullptr, VORN_VOLUMES_OF_USAGE));
  if (!volumes) {
    REPORT_LOG_ERR(kModule, __LINE__, "no mounted volume\n");
    return 0;
  }
  note_volumes(volumes.get());
  for (const VORNMountVolInfo* volume = volumes.get(); volume != nullptr; volume = volume->next) {
    if (VolumeUsageAddVolume(volume, list) < 0) {
      REPORT_LOG_ERR(kModule, __LINE__, "parsing command failed\n");
      return -1;
    }
  }
  return 0;
}

int32_t VolumeUsageGather(const char* profile, const VLIBCSzHash* profileHash, QAZLLNode** list) {
  if (is_unset(profile) || profileHash == nullptr || list == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "Bad Parameter\n");
    return -1;
  }
  if (VolumeUsageEnumVolumes(list) < 0) {
    REPORT_LOG_ERR(kModule, __LINE__, "get volume usage data failed\n");
    return -1;
  }
  return 1;
}

int32_t VolumeUsageStoreHistory(const char* profile, const QAZLLNode* list) {
  std::array<char, 32> date{};
  if (VornQazGetTimeSecond(date.data(), date.size()) < 0 || is_unset(date.data())) {
    REPORT_LOG_ERR(kModule, __LINE__, "get time string failed\n");
    return -1;
  }
  report_trace(kModule, __LINE__, "0. sec=%s\n", date.data());
  int32_t turns = 0;
  while (list != nullptr) {
    const VolumeUsageNode& node = *volume_of(list);
    const VolumeUsageSample& now = *node.samples;
    ++turns;
    if (VornQazDBVolumeUsageInsert(profile, node.name.c_str(), now.sizeUse.c_str(),
                                   now.sizeFree.c_str(), now.percent.c_str(), date.data()) < 0) {
      // The same volume again, without end: only an empty text gets here, and the platform gives
      // none.
      REPORT_LOG_ERR(kModule, __LINE__, "volume usage history insert DB failed\n");
      continue;
    }
    list = list->next;
  }
  if (VornQazDBVolumeUsageRotate() < 0) {
    REPORT_LOG_ERR(kModule, __LINE__, "volume usage db rotate failed\n");
  }
  return turns;
}

int32_t VolumeUsageWriteCurrent(const char* profile, const VLIBCSzHash* profileHash,
                                const QAZLLNode* list) {
  if (!writer_args_are_set(profile, profileHash, list)) {
    return -1;
  }
  return write_block(list, "<script type='text/javascript'>\nvar vornVolumeUsageData = [\n",
                     write_current_row, "\n];\n</script>\n");
}

int32_t VolumeUsageWriteHistory(const char* profile, const VLIBCSzHash* profileHash,
                                const QAZLLNode* list) {
  if (!writer_args_are_set(profile, profileHash, list)) {
    return -1;
  }
  return write_block(list, "<script type='text/javascript'>\nvar vornVolumeUsageDataHistory = {\n",
                     write_history_series, "\n};\n</script>\n");
}

int32_t VolumeUsageWriteCsv(const char* profile, const VLIBCSzHash* profileHash,
                            const QAZLLNode* list) {
  if (!writer_args_are_set(profile, profileHash, list)) {
    return -1;
  }
  const char* csv_dir = set_value(profileHash, "real_path_csv");
  if (csv_dir == nullptr) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "get csv dir failed");
    return -1;
  }
  PathText path;
  path.format("%s/%s.csv", csv_dir, report_format::kVolumeUsage.name);
  FileHandle csv =
      open_report_file(path.c_str(), "w+", kModule, __LINE__, LogForm::kSimple, Costs::kReport);
  if (!csv) {
    return -1;
  }
  std::fputs("Volume, Size, Used, Daty to Full\n", csv.get());
  for (; list != nullptr; list = list->next) {
    write_csv_row(csv.get(), *volume_of(list));
  }
  const bool kept =
      close_report_file(std::move(csv), path.c_str(), kModule, __LINE__, Costs::kReport);
  std::fflush(nullptr);
  if (!kept) {
    return -1;
  }
  finish_csv(report_format::kVolumeUsage, path.c_str());
  return 0;
}

int32_t volume_usage_collect_data(const char* profile, const VLIBCSzHash* profileHash) {
  if (is_unset(profile) || profileHash == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "Bad Parameter\n");
    return -1;
  }
  VolumeList volumes;
  if (VolumeUsageGather(profile, profileHash, &volumes.head) < 0 || volumes.head == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "volume usage get data failed, profile=%s\n", profile);
    return -1;
  }
  VolumeUsageStoreHistory(profile, volumes.head);
  return 0;
}

int32_t volume_usage(ReportArgs* args) {
  if (args == nullptr || is_unset(args->profile) || args->profile_hash == nullptr ||
      args->user_hash == nullptr) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "Bad Parameter");
    return -1;
  }
  const char* profile = args->profile;
  report_trace(kModule, __LINE__, "run volume usage , p=%s\n\n", profile);
  VolumeList volumes;
  const FleetSource* fleet = args->fleet;
  if (fleet != nullptr
          ? !run_over_fleet(*fleet, kOverFleet, add_fleet_sample, &volumes.head, kModule)
          : VolumeUsageGather(profile, args->profile_hash, &volumes.head) < 0 ||
                volumes.head == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "volume usage get data failed, profile=%s\n", profile);
    return -1;
  }
  const bool with_history = fleet != nullptr || wants_history(args->profile_hash);
  if (with_history && fleet == nullptr) {
    report_trace(kModule, __LINE__, "run get data hisotry\n\n");
    if (VornQazDBVolumeUsageSelect(profile, &volumes.head) < 0) {
      REPORT_LOG_ERR(kModule, __LINE__, "get volume usage data history failed\n");
      return -1;
    }
  }
  keep_for_fleet(volumes.head);
  const int32_t shown = VolumeUsageWriteCurrent(profile, args->profile_hash, volumes.head);
  const auto rows = static_cast<uint64_t>(std::max(shown, 0));
  run_facts().rows[report_format::kVolumeUsage.name] = {rows, rows};
  if (with_history) {
    VolumeUsageWriteHistory(profile, args->profile_hash, volumes.head);
  }
  if (VolumeUsageWriteCsv(profile, args->profile_hash, volumes.head) < 0) {
    tell_failed_report(report_format::kVolumeUsage.name);  // which the result doesn't say
  }
  return 0;
}

}  // namespace vornreport
