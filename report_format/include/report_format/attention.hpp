// What a report says deserves attention: the codes with their values. A code's words stand in the
// dictionaries' group "attention" under the code, with its values as {placeholders}; where there
// are `days`, {outlook} too is one: "full in about 24 days (19 to 33)".
#pragma once

#include <span>
#include <string_view>

namespace report_format {

enum class ValueKind : unsigned char {
  kName,     // of a share, volume, user or file: anybody's text
  kBytes,    // a size
  kPercent,  // 93.4
  kDays,     // whole days
  kCount,
  kTime,  // seconds since the epoch
};
const char* word_of(ValueKind kind);  // "name", "bytes", "percent", "days", "count", "time"

struct ValueFormat {
  std::string_view name;
  ValueKind kind;
};

struct AttentionFormat {
  std::string_view code;
  std::string_view section;  // name of the report that tells more
  std::span<const ValueFormat> values;
};

// volume_full           a volume has nothing free
// volume_fills          its forecast gives it a level
// volume_used           how much of it is used gives it a level
// quota_over            a user is over the soft limit on a volume
// quota_near            a user is near it
// quota_more            `n` further users are near or over
// volume_grew           what shares hold on a volume has grown by `bytes` since `date`
// volume_grew_in        most of it in `place`: a share, or a folder below one
// volume_grew_in_by     and most of it by `owner`
// share_largest         the share that takes the most
// owner_most            the owner who takes the most
// duplicates_possible   what duplicates by name and size take
// duplicates_confirmed  what duplicates by content take
// data_oldest           the file that was changed the longest ago
std::span<const AttentionFormat> attention_formats();
// Null for an unknown code.
const AttentionFormat* find_attention(std::string_view code);

}  // namespace report_format
