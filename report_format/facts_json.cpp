// The facts as JSON, written and read: one function for each list and direction, side by side, so
// that a key can't be spelt in two ways.
#include <array>
#include <cmath>
#include <nlohmann/json.hpp>
#include <type_traits>
#include <utility>

#include "facts_scan.hpp"
#include "report_format/attention.hpp"
#include "report_format/facts.hpp"

namespace report_format {
namespace {

using Json = nlohmann::ordered_json;

template <typename T, typename Record>
concept IsA = std::is_same_v<std::remove_const_t<T>, Record>;
template <typename T>
concept Arithmetic = std::is_arithmetic_v<T>;

// In one class, whose functions know each other whatever their order.
struct Codec {
  // --- Reading single values
  // ---------------------------------------------------------------------- What is missing or of
  // another kind leaves `value` as it is.

  static void take(const Json& json, std::string& value) {
    if (json.is_string()) {
      value = json.get<std::string>();
    }
  }
  static void take(const Json& json, bool& value) {
    if (json.is_boolean()) {
      value = json.get<bool>();
    }
  }
  static void take(const Json& json, double& value) {
    if (json.is_number()) {
      value = json.get<double>();
    }
  }
  static void take(const Json& json, std::uint64_t& value) {
    if (json.is_number_unsigned()) {
      value = json.get<std::uint64_t>();
    }
  }
  static void take(const Json& json, std::int64_t& value) {
    constexpr std::uint64_t kMost = INT64_MAX;
    if (json.is_number_integer() &&
        (!json.is_number_unsigned() || json.get<std::uint64_t>() <= kMost)) {
      value = json.get<std::int64_t>();
    }
  }

  template <typename Enum, std::size_t Count>
  static void take_word(const Json& json, Enum& value, const std::array<Enum, Count>& all) {
    for (const Enum one : all) {
      if (json.is_string() && json.get_ref<const std::string&>() == word_of(one)) {
        value = one;
      }
    }
  }
  static void take(const Json& json, Level& value) {
    take_word(json, value, std::array{Level::kOk, Level::kWarning, Level::kCritical});
  }
  static void take(const Json& json, ForecastState& value) {
    using enum ForecastState;
    take_word(json, value, std::array{kFull, kShort, kGrowing, kShrinking, kSteady});
  }

  // --- Writing single values
  // ----------------------------------------------------------------------

  // In ASCII letters, '<' as well as those beyond.
  static void put_json(std::string& out, const Json& value) {
    for (const char c :
         value.dump(-1, ' ', /*ensure_ascii=*/true, Json::error_handler_t::replace)) {
      c == '<' ? out += "\\u003c" : out += c;
    }
  }
  static void put(std::string& out, Level level) { put_json(out, word_of(level)); }
  static void put(std::string& out, ForecastState state) { put_json(out, word_of(state)); }
  static void put(std::string& out, const Arithmetic auto& number) { put_json(out, number); }
  static void put(std::string& out, const std::string& text) { put_json(out, text); }

  // --- Records
  // ------------------------------------------------------------------------------------ A record
  // names its keys once, in fields(); Writer and Reader go through them.

  template <typename Value>
  static void put(std::string& out, const std::vector<Value>& list) {
    const char* before = "[";
    for (const Value& value : list) {
      out += std::exchange(before, ",");
      put(out, value);
    }
    out += list.empty() ? "[]" : "]";
  }
  template <typename Value>
  static void take(const Json& json, std::vector<Value>& list) {
    if (!json.is_array()) {
      return;
    }
    list.clear();
    for (const Json& entry : json) {
      take(entry, list.emplace_back());
    }
  }

  template <typename Value>
  static void put(std::string& out, const std::optional<Value>& value) {
    if (value) {
      put(out, *value);
    } else {
      out += "null";
    }
  }
  template <typename Value>
  static void take(const Json& json, std::optional<Value>& value) {
    if (!json.is_null()) {
      Value taken{};
      take(json, taken);
      value = std::move(taken);
    }
  }

  static void put(std::string& out, const Sample& sample) {
    put_json(out, {sample.time, sample.used});
  }
  static void take(const Json& json, Sample& sample) {
    if (json.is_array() && json.size() == 2) {
      take(json[0], sample.time);
      take(json[1], sample.used);
    }
  }

  static void put(std::string& out, IncidentLevel level) {
    put_json(out, level == IncidentLevel::kError ? "error" : "warning");
  }
  static void take(const Json& json, IncidentLevel& level) {
    level = json == "error" ? IncidentLevel::kError : IncidentLevel::kWarning;
  }

  static void take(const Json& json, AttentionValue& value) {
    if (json.is_string()) {
      value = json.get<std::string>();
    } else if (json.is_number_integer()) {
      std::int64_t number = 0;
      take(json, number);
      value = number;
    } else if (json.is_number()) {
      value = json.get<double>();
    }
  }

  using AttentionValues = std::vector<std::pair<std::string, AttentionValue>>;
  static void put(std::string& out, const AttentionValues& values) {
    Json json = Json::object();
    for (const auto& [name, value] : values) {
      json[name] = std::visit([](const auto& one) { return Json(one); }, value);
    }
    put_json(out, json);
  }
  static void take(const Json& json, AttentionValues& values) {
    values.clear();
    if (json.is_object()) {
      for (const auto& [name, value] : json.items()) {
        take(value, values.emplace_back(name, AttentionValue{}).second);
      }
    }
  }

  // Whether duplicates are told by content is a word in the file.
  template <typename Bool>
  struct Mode {
    Bool by_content;
  };

  // Straight into the text: a tree of JSON values takes ten times its room, and a server may have
  // thousands of owners.
  class Writer {
   public:
    explicit Writer(std::string& out) : out_(out) {}
    template <typename Value>
    void operator()(const char* key, const Value& value) {
      begin(key);
      put(out_, value);
    }
    void operator()(const char* key, Mode<const bool*> mode) {
      begin(key);
      put_json(out_, *mode.by_content ? "content" : "name");
    }

   private:
    void begin(const char* key) {
      out_.append(std::exchange(before_, ",")).append("\"").append(key).append("\":");
    }

    std::string& out_;
    const char* before_ = "{";
  };

  class Reader {
   public:
    explicit Reader(const Json& json) : json_(json) {}
    template <typename Value>
    void operator()(const char* key, Value& value) {
      if (const auto found = json_.find(key); found != json_.end()) {
        take(*found, value);
      }
    }
    void operator()(const char* key, Mode<bool*> mode) {
      const auto found = json_.find(key);
      *mode.by_content = found != json_.end() && *found == "content";
    }

   private:
    const Json& json_;
  };

  // `Is<Record>` is the record or a const one.
  static void fields(auto& field, IsA<Incident> auto& r) {
    field("level", r.level);
    field("kind", r.kind);
    field("what", r.what);
    field("text", r.text);
  }

  static void fields(auto& field, IsA<Jump> auto& r) {
    field("date", r.date);
    field("bytes", r.bytes);
  }

  static void fields(auto& field, IsA<Forecast> auto& r) {
    field("state", r.state);
    field("days", r.days);
    field("days_low", r.days_low);
    field("days_high", r.days_high);
    field("per_day", r.per_day);
    field("window", r.window);
    field("jump", r.jump);
  }

  static void fields(auto& field, IsA<GrownSince> auto& r) {
    field("since", r.since);
    field("files", r.files);
    field("bytes", r.bytes);
  }

  static void fields(auto& field, IsA<Grown> auto& r) {
    field("last", r.last);
    field("week", r.week);
    field("month", r.month);
  }

  static void fields(auto& field, IsA<Cause> auto& r) {
    field("kind", r.kind);
    field("share", r.share);
    field("name", r.name);
    field("bytes", r.bytes);
    field("since", r.since);
  }

  static void fields(auto& field, IsA<VolumeFacts> auto& r) {
    field("id", r.id);
    field("path", r.path);
    field("size", r.size);
    field("used", r.used);
    field("free", r.free);
    field("percent", r.percent);
    field("level", r.level);
    field("forecast", r.forecast);
    field("samples", r.samples);
    field("explained", r.explained);
    field("outside", r.outside);
    field("filled_by", r.filled_by);
    field("grown_by", r.grown_by);
  }

  static void fields(auto& field, IsA<ShareFacts> auto& r) {
    field("name", r.name);
    field("path", r.path);
    field("volume", r.volume);
    field("files", r.files);
    field("folders", r.folders);
    field("bytes", r.bytes);
    field("allocated", r.allocated);
    field("unreadable", r.unreadable);
    field("other", r.other);
    field("whole", r.whole);
    field("index", r.index);
    field("grown", r.grown);
    field("samples", r.samples);
  }

  static void fields(auto& field, IsA<OwnerPlace> auto& r) {
    field("share", r.share);
    field("volume", r.volume);
    field("files", r.files);
    field("bytes", r.bytes);
  }

  static void fields(auto& field, IsA<OwnerFacts> auto& r) {
    field("name", r.name);
    field("files", r.files);
    field("bytes", r.bytes);
    field("grown", r.grown);
    field("places", r.places);
  }

  static void fields(auto& field, IsA<TypeShare> auto& r) {
    field("share", r.share);
    field("files", r.files);
    field("bytes", r.bytes);
  }

  static void fields(auto& field, IsA<TypeFacts> auto& r) {
    field("type", r.type);
    field("files", r.files);
    field("bytes", r.bytes);
    field("grown", r.grown);
    field("shares", r.shares);
  }

  static void fields(auto& field, IsA<AgeFacts> auto& r) {
    field("age", r.age);
    field("files", r.files);
    field("bytes", r.bytes);
  }

  static void fields(auto& field, IsA<QuotaFacts> auto& r) {
    field("volume", r.volume);
    field("user", r.user);
    field("used", r.used);
    field("quota", r.quota);
    field("percent", r.percent);
    field("level", r.level);
    field("forecast", r.forecast);
  }

  static void fields(auto& field, IsA<DuplicateFacts> auto& r) {
    field("mode", Mode<decltype(&r.by_content)>{&r.by_content});
    field("groups", r.groups);
    field("files", r.files);
    field("reclaimable", r.reclaimable);
  }

  static void fields(auto& field, IsA<Attention> auto& r) {
    field("level", r.level);
    field("code", r.code);
    field("values", r.values);
    field("section", r.section);
  }

  static void fields(auto& field, IsA<ReportFacts> auto& r) {
    field("name", r.name);
    field("rows", r.rows);
    field("shown", r.shown);
    field("limit", r.limit);
    field("csv", r.csv);
    field("ok", r.ok);
  }

  static void fields(auto& field, IsA<Facts> auto& r) {
    field("host", r.host);
    field("profile", r.profile);
    field("time_zone", r.time_zone);
    field("language", r.language);
    field("started", r.started);
    field("finished", r.finished);
    field("complete", r.complete);
    field("incidents", r.incidents);
    field("volumes", r.volumes);
    field("shares", r.shares);
    field("owners", r.owners);
    field("types", r.types);
    field("ages", r.ages);
    field("quotas", r.quotas);
    field("duplicates", r.duplicates);
    field("attention", r.attention);
    field("reports", r.reports);
  }

  static void put(std::string& out,
                  const auto& record) requires(!Arithmetic<std::remove_cvref_t<decltype(record)>>) {
    Writer writer(out);
    fields(writer, record);
    out += "}";
  }

  template <typename Record>
  static void take(const Json& json, Record& record) {
    if (json.is_object()) {
      Reader reader(json);
      fields(reader, record);
    }
  }
};

}  // namespace

Json to_json(const Facts& facts) {
  return Json::parse(to_line(facts));
}

std::string line_of(const Json& json) {
  std::string line;
  Codec::put_json(line, json);
  return line;
}

std::string to_line(const Facts& facts) {
  std::string line;
  Codec::Writer writer(line);
  writer("format", kFactsFormat);
  Codec::fields(writer, facts);
  line += "}";
  return line;
}

std::optional<Facts> facts_of(std::string_view text) {
  if (has_object_of_many_keys(text)) {
    return std::nullopt;
  }
  // Owners, of which there may be thousands, are taken one by one.
  std::vector<OwnerFacts> owners;
  bool is_owners = false;
  bool is_inside = false;
  using Event = Json::parse_event_t;
  const auto take_owners = [&](int depth, Event event, Json& parsed) {
    if (depth == 1 && event == Event::key) {
      is_owners = parsed == "owners";
    } else if (depth == 1 && event == Event::array_start && is_owners) {
      is_inside = true;
      owners.clear();
    } else if (depth == 1 && event == Event::array_end) {
      is_inside = false;
    } else if (depth == 2 && event == Event::object_end && is_inside) {
      Codec::take(parsed, owners.emplace_back());
      return false;
    }
    return true;
  };
  const Json json = Json::parse(text, take_owners, /*allow_exceptions=*/false);
  if (!json.is_object()) {
    return std::nullopt;
  }
  const auto format = json.find("format");
  if (format == json.end() || *format != kFactsFormat) {
    return std::nullopt;
  }
  Facts facts;
  Codec::take(json, facts);
  if (facts.owners) {
    facts.owners = std::move(owners);
  }
  return facts;
}

}  // namespace report_format
