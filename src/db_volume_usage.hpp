// The history of volume usage: one database for all profiles, one row for each volume and
// collection run. Every operation opens the database, runs one statement and closes it.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "report_format/facts.hpp"
#include "vorn/database.h"
#include "vorn/list.h"
#include "vornreport/fixed_text.hpp"

namespace vornreport {

// The state of a volume at one time, as text.
struct VolumeUsageSample {
  FixedText<32> sampleDate;  // seconds since the epoch
  FixedText<64> sizeUse;     // bytes
  FixedText<64> sizeFree;    // bytes
  FixedText<8> percent;      // 0 to 100, cut at 7 characters: "45.1234"
  VolumeUsageSample* next;
};

// A volume and its samples: the current one, then the stored ones from newest to oldest.
struct VolumeUsageNode {
  FixedText<32> name;          // mount path; empty for a stored volume that is no longer mounted
  std::string path;            // all of it
  int32_t days;                // until it is full; -1: no estimate
  VolumeUsageSample* samples;  // owned
  std::string fleet_name;      // of a server of the fleet: "server:/path"; `name` is empty then
};

// The node of a list element.
inline VolumeUsageNode* volume_of(const QAZLLNode* element) {
  return static_cast<VolumeUsageNode*>(element->data);
}

// Frees a node with its samples: the release function of a volume list.
void VolumeUsageFreeNode(void* node);

extern "C" {

// Stores one sample. -1 for a null or empty argument; otherwise 0, also when it could not be stored
// (logged).
int32_t VornQazDBVolumeUsageInsert(const char* profile, const char* volume, const char* sizeUse,
                                   const char* sizeFree, const char* percent,
                                   const char* sampleDate);

// Puts the samples stored for the profile "global" behind the current sample of each volume of
// `list` and estimates its days; a stored volume that the list lacks becomes a nameless node for
// each of its samples. `profile` must only be non-empty. -1 for bad arguments; otherwise 0, also
// when the history could not be read (logged).
int32_t VornQazDBVolumeUsageSelect(const char* profile, QAZLLNode** list);

// Removes the oldest dates beyond the newest 1000, five at most a call. 0.
int32_t VornQazDBVolumeUsageRotate(void);
}

// The samples that the profile "global" has stored since `since` (seconds since the epoch), by the
// name under which a volume is stored: its mount path cut at 31 bytes. Nothing (logged) when the
// history can't be read.
using StoredSamples = std::map<std::string, std::vector<report_format::Sample>>;
std::optional<StoredSamples> VolumeUsageSamples(int64_t since);

// Runs one statement and drops its rows. -1 for an empty one; otherwise 0 whatever happened.
int32_t VolumeUsageDBExec(const char* sql);

// The node of the list whose name is `volume`, or null.
VolumeUsageNode* VolumeUsageListFind(const QAZLLNode* list, const char* volume);

// Walks a select result into the list and then estimates the days. 0 or -1.
int32_t VolumeUsageLoadRows(VORNDBResult* result, QAZLLNode** list);

// The straight-line time until each volume's free space is used up, in whole days, at the rate
// since its newest stored sample that shows less usage than now; unchanged where no sample does.
void VolumeUsageEstimateDays(const QAZLLNode* list);

}  // namespace vornreport
