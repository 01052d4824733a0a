#include "db_volume_usage.hpp"

#include <array>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>

#include "facts/run_facts.hpp"
#include "history_db.hpp"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/db_volume_usage";
constexpr char kTable[] = "VolumeUsage";
constexpr char kRotation[] =
    "delete from VolumeUsage where sampleDate in (select distinct sampleDate from VolumeUsage "
    "order by sampleDate desc limit 1000,5);";
constexpr uint64_t kSecondsPerDay = 86400;

using EscapedText = std::array<char, 4096>;

bool escape(VORNDB* db, const char* text, EscapedText& out) {
  return VORNDBEscapeStringEX(db, out.data(), out.size(), text, std::strlen(text)) != 0;
}

// What goes into the statement escaped; sizes are digits only.
struct EscapedSample {
  EscapedText profile{};
  EscapedText volume{};
  EscapedText percent{};
  EscapedText date{};
};

bool escape_sample(VORNDB* db, const char* profile, const char* volume, const char* percent,
                   const char* date, EscapedSample& out) {
  // The profile's failure names the volume: operators look for this wording.
  if (!escape(db, profile, out.profile) || !escape(db, volume, out.volume)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to escape szVolume=%s\n", volume);
    return false;
  }
  if (!escape(db, percent, out.percent)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to escape szPercent=%s\n", percent);
    return false;
  }
  report_trace(kModule, __LINE__, "1.date=%s, esc date=%s\n\n", date, out.date.data());
  if (!escape(db, date, out.date)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to escape szDate=%s\n", date);
    return false;
  }
  report_trace(kModule, __LINE__, "date=%s, esc date=%s\n\n", date, out.date.data());
  return true;
}

uint64_t to_u64(const char* text) {
  return std::strtoull(text, nullptr, 10);
}

int32_t to_i32(const char* text) {
  return static_cast<int32_t>(std::strtol(text, nullptr, 10));
}

std::unique_ptr<VolumeUsageSample> read_sample(VORNDBResult* result, VORNDBRow* row) {
  std::unique_ptr<VolumeUsageSample> sample(new (std::nothrow) VolumeUsageSample{});
  if (sample) {
    sample->sizeUse.format("%s", field(result, row, "sizeUse"));
    sample->sizeFree.format("%s", field(result, row, "sizeFree"));
    sample->percent.format("%s", field(result, row, "percent"));
    sample->sampleDate.format("%s", field(result, row, "sampleDate"));
  }
  return sample;
}

// A stored volume that isn't mounted: each of its samples becomes a nameless node. False without
// memory.
bool add_nameless(QAZLLNode** list, std::unique_ptr<VolumeUsageSample> sample) {
  std::unique_ptr<VolumeUsageNode> node(new (std::nothrow) VolumeUsageNode{});
  if (!node) {
    return false;
  }
  node->days = -1;
  node->samples = sample.get();
  const QAZLLCompare appends = [](const void*, const void*) { return 0; };
  if (QAZLLadd(list, node.get(), appends) < 0) {
    return false;
  }
  static_cast<void>(sample.release());
  static_cast<void>(node.release());
  return true;
}

void tell_lost_sample(const char* volume) {
  record_incident(
      "history_lost", volume,
      std::string("the sample of ") + volume + " can't be stored in the history; the log says why",
      AlreadyLogged::kYes);
}

// Whether `now` and an older sample give an estimate; then `days` is it.
bool estimate(const VolumeUsageNode& node, const VolumeUsageSample& now,
              const VolumeUsageSample& then, int32_t& days) {
  const uint64_t used_now = to_u64(now.sizeUse.c_str());
  const uint64_t used_then = to_u64(then.sizeUse.c_str());
  if (used_now <= used_then) {
    return false;
  }
  const int32_t date_now = to_i32(now.sampleDate.c_str());
  const int32_t date_then = to_i32(then.sampleDate.c_str());
  report_trace(kModule, __LINE__, "volume=%s\n", node.name.c_str());
  report_trace(kModule, __LINE__, "=====>s1=%llu, s2=%llu\n\n",
               static_cast<unsigned long long>(used_now),
               static_cast<unsigned long long>(used_then));
  report_trace(kModule, __LINE__, "=====>d1=%d, d2=%d\n\n", date_now, date_then);
  // Wraps as 32-bit arithmetic does, for dates of any kind.
  const auto interval =
      static_cast<int32_t>(static_cast<uint32_t>(date_now) - static_cast<uint32_t>(date_then));
  if (interval == 0) {
    report_trace(kModule, __LINE__, "time interval=0, check next\n");
    return false;
  }
  report_trace(kModule, __LINE__, "time interval=%d\n", interval);
  // A clock that was set back gives a negative interval, which is a huge unsigned one: speed 0.
  const uint64_t speed =
      (used_now - used_then) / static_cast<uint64_t>(static_cast<int64_t>(interval));
  if (speed == 0) {
    report_trace(kModule, __LINE__, "ullSpeed=0, check next\n");
    return false;
  }
  report_trace(kModule, __LINE__, "speed=%llu\n", static_cast<unsigned long long>(speed));
  const uint64_t day_speed = speed * kSecondsPerDay;
  report_trace(kModule, __LINE__, "t=%d, day speed=%llu, free size=%s\n\n", interval,
               static_cast<unsigned long long>(day_speed), now.sizeFree.c_str());
  if (day_speed == 0) {
    return false;  // only by overflow, at 2^64 bytes a day
  }
  days = static_cast<int32_t>(to_u64(now.sizeFree.c_str()) / day_speed);
  report_trace(kModule, __LINE__, "day=%d\n", days);
  return true;
}

}  // namespace

void VolumeUsageFreeNode(void* data) {
  std::unique_ptr<VolumeUsageNode> node(static_cast<VolumeUsageNode*>(data));
  while (node && node->samples != nullptr) {
    const std::unique_ptr<VolumeUsageSample> sample(node->samples);
    node->samples = sample->next;
  }
}

int32_t VornQazDBVolumeUsageInsert(const char* profile, const char* volume, const char* sizeUse,
                                   const char* sizeFree, const char* percent,
                                   const char* sampleDate) {
  for (const char* argument : {profile, volume, sizeUse, sizeFree, percent, sampleDate}) {
    if (is_unset(argument)) {
      REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
      return -1;
    }
  }
  const DbHandle db = open_history(kModule, __LINE__);
  auto escaped = std::make_unique<EscapedSample>();
  if (!db || !escape_sample(db.get(), profile, volume, percent, sampleDate, *escaped)) {
    tell_lost_sample(volume);
    return 0;
  }
  FixedText<4096> sql;
  sql.format(
      "INSERT INTO %s (profile, volume, sizeUse, sizeFree, percent, sampleDate) VALUES ('%s', "
      "'%s', '%s', '%s', '%s', '%s'); ",
      kTable, escaped->profile.data(), escaped->volume.data(), sizeUse, sizeFree,
      escaped->percent.data(), escaped->date.data());
  ResultHandle result;
  if (!execute(db.get(), sql.c_str(), result)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to insert volume usage DB, sql=%s\n", sql.c_str());
    tell_lost_sample(volume);
  }
  return 0;
}

std::optional<StoredSamples> VolumeUsageSamples(int64_t since) {
  const DbHandle db = open_history(kModule, __LINE__);
  if (!db) {
    return std::nullopt;
  }
  FixedText<4096> sql;
  sql.format(
      "select volume, sizeUse, sampleDate from %s where profile='%s' and cast(sampleDate as "
      "integer) >= %lld; ",
      kTable, "global", static_cast<long long>(since));
  ResultHandle result;
  if (!execute(db.get(), sql.c_str(), result)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to select volume usage DB, sql=%s\n", sql.c_str());
    return std::nullopt;
  }
  StoredSamples samples;
  VORNDBRow* row = nullptr;
  while (result && VORNDBFetchRow(result.get(), &row) != -1) {
    samples[field(result.get(), row, "volume")].push_back(
        {std::strtoll(field(result.get(), row, "sampleDate"), nullptr, 10),
         to_u64(field(result.get(), row, "sizeUse"))});
  }
  return samples;
}

int32_t VornQazDBVolumeUsageSelect(const char* profile, QAZLLNode** list) {
  if (is_unset(profile) || list == nullptr || *list == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return -1;
  }
  const DbHandle db = open_history(kModule, __LINE__);
  if (!db) {
    return 0;
  }
  FixedText<4096> sql;
  sql.format("select * from %s where profile='%s' order by sampleDate; ", kTable, "global");
  ResultHandle result;
  if (!execute(db.get(), sql.c_str(), result)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to select volume usage DB, sql=%s\n", sql.c_str());
    return 0;
  }
  VolumeUsageLoadRows(result.get(), list);
  return 0;
}

int32_t VornQazDBVolumeUsageRotate() {
  return VolumeUsageDBExec(kRotation);
}

int32_t VolumeUsageDBExec(const char* sql) {
  if (is_unset(sql)) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return -1;
  }
  const DbHandle db = open_history(kModule, __LINE__);
  ResultHandle result;
  if (db && !execute(db.get(), sql, result)) {
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to select volume usage DB, sql=%s\n", sql);
  }
  return 0;
}

VolumeUsageNode* VolumeUsageListFind(const QAZLLNode* list, const char* volume) {
  if (list == nullptr || is_unset(volume)) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return nullptr;
  }
  for (; list != nullptr; list = list->next) {
    if (std::strcmp(volume_of(list)->name.c_str(), volume) == 0) {
      return volume_of(list);
    }
  }
  return nullptr;
}

int32_t VolumeUsageLoadRows(VORNDBResult* result, QAZLLNode** list) {
  if (result == nullptr || list == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return -1;
  }
  VORNDBRow* row = nullptr;
  for (int count = 0; VORNDBFetchRow(result, &row) != -1; ++count) {
    FixedText<128> volume;
    volume.format("%s", field(result, row, "volume"));
    std::unique_ptr<VolumeUsageSample> sample = read_sample(result, row);
    if (!sample) {
      REPORT_LOG_ERR(kModule, __LINE__, "memory allocate failed\n");
      return -1;
    }
    report_trace(kModule, __LINE__, "===========>fetch row i=%d, volume=%s, date=%s\n\n", count,
                 volume.c_str(), sample->sampleDate.c_str());
    VolumeUsageNode* node = VolumeUsageListFind(*list, volume.c_str());
    if (node != nullptr && node->samples != nullptr) {
      sample->next = node->samples->next;
      node->samples->next = sample.release();
    } else if (!add_nameless(list, std::move(sample))) {
      REPORT_LOG_ERR(kModule, __LINE__, "memory allocate failed\n");
      return -1;
    }
  }
  VolumeUsageEstimateDays(*list);
  return 0;
}

void VolumeUsageEstimateDays(const QAZLLNode* list) {
  if (list == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return;
  }
  for (; list != nullptr; list = list->next) {
    VolumeUsageNode& node = *volume_of(list);
    for (const VolumeUsageSample* then = node.samples; then != nullptr; then = then->next) {
      if (estimate(node, *node.samples, *then, node.days)) {
        break;
      }
    }
  }
}

}  // namespace vornreport
