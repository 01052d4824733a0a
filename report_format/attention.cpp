#include "report_format/attention.hpp"

#include <algorithm>
#include <array>

#include "report_format/reports.hpp"

namespace report_format {
namespace {

using enum ValueKind;

constexpr ValueFormat kVolumeFull[] = {{"volume", kName}, {"percent", kPercent}, {"used", kBytes}};
constexpr ValueFormat kVolumeFills[] = {
    {"volume", kName},     {"days", kDays},  {"days_low", kDays}, {"days_high", kDays},
    {"percent", kPercent}, {"free", kBytes}, {"window", kDays}};
constexpr ValueFormat kVolumeUsed[] = {{"volume", kName}, {"percent", kPercent}, {"free", kBytes}};
constexpr ValueFormat kQuota[] = {
    {"user", kName}, {"volume", kName}, {"used", kBytes}, {"quota", kBytes}, {"percent", kPercent}};
constexpr ValueFormat kMore[] = {{"n", kCount}};
constexpr ValueFormat kGrew[] = {{"volume", kName}, {"bytes", kBytes}, {"date", kTime}};
constexpr ValueFormat kGrewIn[] = {
    {"volume", kName}, {"bytes", kBytes}, {"date", kTime}, {"place", kName}};
constexpr ValueFormat kGrewInBy[] = {
    {"volume", kName}, {"bytes", kBytes}, {"date", kTime}, {"place", kName}, {"owner", kName}};
constexpr ValueFormat kShareValues[] = {{"share", kName}, {"bytes", kBytes}};
constexpr ValueFormat kOwnerValues[] = {{"owner", kName}, {"bytes", kBytes}};
constexpr ValueFormat kDuplicates[] = {{"bytes", kBytes}, {"groups", kCount}};
constexpr ValueFormat kOldest[] = {{"date", kTime}, {"file", kName}};

constexpr std::array kFormats{
    AttentionFormat{"volume_full", kVolumeUsage.name, kVolumeFull},
    AttentionFormat{"volume_fills", kVolumeUsage.name, kVolumeFills},
    AttentionFormat{"volume_used", kVolumeUsage.name, kVolumeUsed},
    AttentionFormat{"quota_over", kQuotaUsage.name, kQuota},
    AttentionFormat{"quota_near", kQuotaUsage.name, kQuota},
    AttentionFormat{"quota_more", kQuotaUsage.name, kMore},
    AttentionFormat{"volume_grew", kGrowth.name, kGrew},
    AttentionFormat{"volume_grew_in", kGrowth.name, kGrewIn},
    AttentionFormat{"volume_grew_in_by", kGrowth.name, kGrewInBy},
    AttentionFormat{"share_largest", kShareList.name, kShareValues},
    AttentionFormat{"owner_most", kFileOwner.name, kOwnerValues},
    AttentionFormat{"duplicates_possible", kDuplicateFile.name, kDuplicates},
    AttentionFormat{"duplicates_confirmed", kDuplicateFile.name, kDuplicates},
    AttentionFormat{"data_oldest", kLeastModify.name, kOldest},
};

}  // namespace

const char* word_of(ValueKind kind) {
  constexpr const char* kWords[] = {"name", "bytes", "percent", "days", "count", "time"};
  return kWords[static_cast<unsigned>(kind)];
}

std::span<const AttentionFormat> attention_formats() {
  return kFormats;
}

const AttentionFormat* find_attention(std::string_view code) {
  const auto* found = std::find_if(kFormats.begin(), kFormats.end(),
                                   [code](const auto& format) { return format.code == code; });
  return found == kFormats.end() ? nullptr : found;
}

}  // namespace report_format
