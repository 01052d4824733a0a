// Usage of the mounted volumes, now and over time.
#pragma once

#include "db_volume_usage.hpp"
#include "vorn/volume.h"
#include "vornreport/report_args.hpp"

namespace vornreport {

// The report: current usage with days until full, with the history when the profile key
// `volume_history` is true, and a CSV file. 0 when the blocks were attempted, else -1.
int32_t volume_usage(ReportArgs* args);
// Stores one sample for every volume in the history and rotates it. 0 or -1.
int32_t volume_usage_collect_data(const char* profile, const VLIBCSzHash* profileHash);

// Makes the list of volumes with their current state. 1 or -1.
int32_t VolumeUsageGather(const char* profile, const VLIBCSzHash* profileHash, QAZLLNode** list);
// 0 or -1.
int32_t VolumeUsageEnumVolumes(QAZLLNode** list);
int32_t VolumeUsageAddVolume(const VORNMountVolInfo* volumeRecord, QAZLLNode** list);
// The number of turns, or -1.
int32_t VolumeUsageStoreHistory(const char* profile, const QAZLLNode* list);

// The writers. The number of volumes written, or -1; the CSV writer 0 or -1.
int32_t VolumeUsageWriteCurrent(const char* profile, const VLIBCSzHash* profileHash,
                                const QAZLLNode* list);
int32_t VolumeUsageWriteHistory(const char* profile, const VLIBCSzHash* profileHash,
                                const QAZLLNode* list);
int32_t VolumeUsageWriteCsv(const char* profile, const VLIBCSzHash* profileHash,
                            const QAZLLNode* list);

}  // namespace vornreport
