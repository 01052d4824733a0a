// The facts of a run: what it has found out, for everyone who tells it. They stand as one JSON
// object in report.json beside the page and in the page's block vornFacts.
//
// Sizes are bytes, times seconds since the epoch. Texts are UTF-8; of names from disk the bytes
// that are none stand as the four characters \xff.
#pragma once

#include <cstdint>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

namespace report_format {

// Raised by a change that makes a reader of the former one read wrong things.
inline constexpr int kFactsFormat = 1;

enum class Level : std::uint8_t { kOk, kWarning, kCritical };
const char* word_of(Level level);  // "ok", "warning", "critical"

// --- Incidents ----------------------------------------------------------------------------------

enum class IncidentLevel : std::uint8_t { kWarning, kError };

// Something without which the report would look complete and isn't.
struct Incident {
  IncidentLevel level = IncidentLevel::kWarning;
  std::string kind;  // of the table below
  std::string what;  // what it concerns: a share, a volume, a report
  std::string text;  // one English sentence: what is wrong and what to do
};

struct IncidentKind {
  std::string_view kind;
  IncidentLevel level;
  // Whether sums over shares can no longer be trusted to tell which is the largest.
  bool spoils_sums;
};

inline constexpr IncidentKind kIncidentKinds[] = {
    {"share_missing", IncidentLevel::kError, true},
    {"share_part", IncidentLevel::kWarning, true},
    {"share_overlap", IncidentLevel::kWarning, true},
    {"report_failed", IncidentLevel::kError, false},
    {"volume_unknown", IncidentLevel::kError, false},
    {"quota_failed", IncidentLevel::kError, false},
    {"users_unknown", IncidentLevel::kError, false},
    {"history_lost", IncidentLevel::kWarning, false},
    {"compare_stopped", IncidentLevel::kError, false},
    {"fleet_unreachable", IncidentLevel::kWarning, false},
    {"server_overdue", IncidentLevel::kWarning, false},
    {"index_refused", IncidentLevel::kWarning, false},
};
// Null for an unknown kind.
const IncidentKind* find_incident_kind(std::string_view kind);

// --- Forecast -----------------------------------------------------------------------------------

enum class ForecastState : std::uint8_t { kFull, kShort, kGrowing, kShrinking, kSteady };
const char* word_of(ForecastState state);  // "full", "short", "growing", "shrinking", "steady"

struct Jump {
  std::int64_t date = 0;
  std::int64_t bytes = 0;  // negative for a fall
};

struct Forecast {
  ForecastState state = ForecastState::kShort;
  // Whole days until nothing is free; only of kGrowing.
  std::optional<std::int64_t> days, days_low, days_high;
  std::optional<std::int64_t> per_day;  // bytes; nothing when kFull or kShort
  std::int64_t window = 0;              // whole days between the first and last sample it rests on
  std::optional<Jump> jump;             // the newest of the last 14 days
};

struct Sample {
  std::int64_t time = 0;
  std::uint64_t used = 0;
};

// --- Lists --------------------------------------------------------------------------------------

struct GrownSince {
  std::int64_t since = 0;
  std::int64_t files = 0;
  std::int64_t bytes = 0;
};
struct Grown {
  std::optional<GrownSince> last, week, month;
};

// A part of what a volume holds, or of what grew on it.
struct Cause {
  std::string kind;  // "share", "owner" or "folder"
  std::string share;
  std::string name;
  std::int64_t bytes = 0;
  std::optional<std::int64_t> since;
};

struct VolumeFacts {
  std::string id;    // as the blocks of the page call it
  std::string path;  // where it is mounted
  std::uint64_t size = 0, used = 0, free = 0;
  double percent = 0;  // used
  Level level = Level::kOk;
  Forecast forecast;
  std::vector<Sample> samples;  // one a day, oldest first, at most 90
  std::optional<std::int64_t> explained, outside;
  std::optional<std::vector<Cause>> filled_by, grown_by;
};

struct ShareFacts {
  std::string name, path;
  std::string volume;  // mount path
  std::uint64_t files = 0;
  std::uint64_t folders = 0;  // below the share's own
  std::uint64_t bytes = 0, allocated = 0;
  std::uint64_t unreadable = 0;  // files and folders
  std::uint64_t other = 0;       // entries that are neither files nor folders
  bool whole = false;            // everything in it was read
  bool index = false;            // its files come from its index, which tells no space on disk
  std::optional<Grown> grown;
  std::optional<std::vector<Sample>> samples;
};

struct OwnerPlace {
  std::string share, volume;
  std::uint64_t files = 0, bytes = 0;
};
struct OwnerFacts {
  std::string name;
  std::uint64_t files = 0, bytes = 0;
  std::optional<Grown> grown;
  std::vector<OwnerPlace> places;  // by size
};

struct TypeShare {
  std::string share;
  std::uint64_t files = 0, bytes = 0;
};
struct TypeFacts {
  std::string type;  // the label, as reportUI_file_type_image
  std::uint64_t files = 0, bytes = 0;
  std::optional<Grown> grown;
  std::vector<TypeShare> shares;  // by size
};

struct AgeFacts {
  std::string age;
  std::uint64_t files = 0, bytes = 0;
};

struct QuotaFacts {
  std::string volume;  // mount path
  std::string user;
  std::uint64_t used = 0, quota = 0;
  double percent = 0;
  Level level = Level::kOk;
  std::optional<Forecast> forecast;
};

struct DuplicateFacts {
  bool by_content = false;  // else by name and size
  std::uint64_t groups = 0;
  std::uint64_t files = 0;        // physical ones
  std::uint64_t reclaimable = 0;  // bytes of all but one of each group
};

using AttentionValue = std::variant<std::string, std::int64_t, double>;
struct Attention {
  Level level = Level::kOk;
  std::string code;                                            // see attention.hpp
  std::vector<std::pair<std::string, AttentionValue>> values;  // of the code's table
  std::string section;                                         // report that tells more

  // Null when it lacks the value.
  const AttentionValue* find(std::string_view name) const;
};

struct ReportFacts {
  std::string name;
  std::uint64_t rows = 0;              // of the report
  std::uint64_t shown = 0;             // of these, in the page
  std::optional<std::uint64_t> limit;  // of the page
  std::optional<std::string> csv;      // path of the file with the rows, below the report's folder
  bool ok = true;
};

struct Facts {
  std::string host, profile, time_zone, language;
  std::int64_t started = 0, finished = 0;
  bool complete = true;  // no incident of level error
  std::vector<Incident> incidents;
  std::vector<VolumeFacts> volumes;               // the most pressing first
  std::optional<std::vector<ShareFacts>> shares;  // by size; nothing without a walk
  std::optional<std::vector<OwnerFacts>> owners;  // by size
  std::optional<std::vector<TypeFacts>> types;    // by size
  std::optional<std::vector<AgeFacts>> ages;
  std::optional<std::vector<QuotaFacts>> quotas;  // the most pressing first, at most 20
  std::optional<DuplicateFacts> duplicates;
  std::vector<Attention> attention;  // the worst first
  std::vector<ReportFacts> reports;  // in page order
};

// The level of the worst that deserves attention.
Level worst_level(const Facts& facts);

// --- JSON ---------------------------------------------------------------------------------------

// Every key is there; what is absent is null.
nlohmann::ordered_json to_json(const Facts& facts);

// In one line of ASCII letters where JSON allows it, every '<' as \u003c, so that it can stand in a
// script element as well as in a file.
std::string line_of(const nlohmann::ordered_json& json);
std::string to_line(const Facts& facts);

// The facts of a text that to_line() has written; it may come from elsewhere. Keys that aren't
// known are left aside and those that are missing or of another kind keep their default. Nothing
// for what is no JSON object, has another format, or an object of more than 256 keys.
std::optional<Facts> facts_of(std::string_view text);

// When the run began that wrote `text`, read no further than needed; nothing when it doesn't tell.
std::optional<std::int64_t> started_of(std::string_view text);

// The largest report.json that anyone reads.
inline constexpr std::size_t kLargestFacts = std::size_t{64} << 20U;

// `name` as it stands in facts: bytes that are no UTF-8 as \xff.
std::string facts_text(std::string_view name);

}  // namespace report_format
