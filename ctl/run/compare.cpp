// vornctl reports PROFILE compare: what grew between two reports, as both tell it in report.json.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "run/commands.hpp"

namespace ctl {
namespace {

using Json = nlohmann::ordered_json;
using report_format::Facts;

struct Options {
  std::string profile;
  std::string from;
  std::string to;
  bool json = false;
};

// What a report counts of a share, volume, owner or type.
struct Count {
  std::uint64_t bytes = 0;
  std::optional<std::uint64_t> files;  // volumes have none
  bool whole = true;                   // nothing of it is missing
};
using Counts = std::map<std::string, Count>;

// What it counts in both reports; nothing where it doesn't stand.
struct Pair {
  std::string name;
  std::optional<Count> before, after;

  // The numbers come from files, so nothing is said of their size: they wrap.
  std::int64_t bytes() const {
    return static_cast<std::int64_t>((after ? after->bytes : 0) - (before ? before->bytes : 0));
  }
  std::uint64_t magnitude() const {
    const auto change = static_cast<std::uint64_t>(bytes());
    return bytes() < 0 ? 0 - change : change;
  }
};
using Pairs = std::vector<Pair>;

// Everything of one kind; nothing when a report wasn't asked for it.
struct Group {
  const char* kind;  // in the table
  const char* key;   // in JSON
  std::optional<Counts> (*counts)(const Facts& facts);
};

template <typename List>
std::optional<Counts> counted(const std::optional<List>& list,
                              std::string List::value_type::*name) {
  if (!list) {
    return std::nullopt;
  }
  Counts counts;
  for (const auto& entry : *list) {
    counts[entry.*name] = {entry.bytes, entry.files, true};
  }
  return counts;
}

std::optional<Counts> volumes_of(const Facts& facts) {
  Counts counts;
  for (const report_format::VolumeFacts& volume : facts.volumes) {
    counts[volume.path] = {volume.used, std::nullopt, true};
  }
  return counts;
}

std::optional<Counts> shares_of(const Facts& facts) {
  auto counts = counted(facts.shares, &report_format::ShareFacts::name);
  for (const report_format::ShareFacts& share :
       facts.shares.value_or(std::vector<report_format::ShareFacts>{})) {
    (*counts)[share.name].whole = share.whole;
  }
  return counts;
}

std::optional<Counts> owners_of(const Facts& facts) {
  return counted(facts.owners, &report_format::OwnerFacts::name);
}

std::optional<Counts> types_of(const Facts& facts) {
  return counted(facts.types, &report_format::TypeFacts::type);
}

constexpr Group kGroups[] = {{"volume", "volumes", volumes_of},
                             {"share", "shares", shares_of},
                             {"owner", "owners", owners_of},
                             {"type", "types", types_of}};

// All of both, what has changed the most first.
std::optional<Pairs> paired(const Group& group, const Facts& before, const Facts& after) {
  const auto old_counts = group.counts(before);
  const auto new_counts = group.counts(after);
  if (!old_counts || !new_counts) {
    return std::nullopt;
  }
  std::map<std::string, Pair> by_name;
  for (const auto& [name, count] : *old_counts) {
    by_name[name].before = count;
  }
  for (const auto& [name, count] : *new_counts) {
    by_name[name].after = count;
  }
  Pairs pairs;
  for (auto& [name, pair] : by_name) {
    pair.name = name;
    pairs.push_back(pair);
  }
  std::stable_sort(pairs.begin(), pairs.end(),
                   [](const Pair& a, const Pair& b) { return a.magnitude() > b.magnitude(); });
  return pairs;
}

// --- Output -------------------------------------------------------------------------------------

struct Side {
  admin::StoredReport report;
  Facts facts;
};

Json number_or_null(const std::optional<std::uint64_t>& number) {
  return number ? Json(*number) : Json(nullptr);
}

Json json_of(const Pair& pair) {
  const auto bytes = [](const std::optional<Count>& count) {
    return count ? Json(count->bytes) : Json(nullptr);
  };
  const auto files = [](const std::optional<Count>& count) {
    return number_or_null(count ? count->files : std::nullopt);
  };
  return {
      {"name", pair.name},
      {"bytes",
       {{"before", bytes(pair.before)}, {"after", bytes(pair.after)}, {"change", pair.bytes()}}},
      {"files", {{"before", files(pair.before)}, {"after", files(pair.after)}}},
      {"whole", (!pair.before || pair.before->whole) && (!pair.after || pair.after->whole)}};
}

std::string change_text(const Pair& pair) {
  return (pair.bytes() < 0 ? "-" : "+") + size_text(pair.magnitude());
}

std::string files_text(const Pair& pair) {
  const auto of = [](const std::optional<Count>& count) {
    return count ? count->files.value_or(0) : 0;
  };
  const auto change = static_cast<std::int64_t>(of(pair.after) - of(pair.before));
  const bool is_told = (pair.before && pair.before->files) || (pair.after && pair.after->files);
  return is_told ? (change < 0 ? "" : "+") + std::to_string(change) : "-";
}

std::string note(const Pair& pair) {
  const auto is_part = [](const std::optional<Count>& count) { return count && !count->whole; };
  return !pair.before                                  ? "new"
         : !pair.after                                 ? "gone"
         : is_part(pair.before) || is_part(pair.after) ? "counted in part"
                                                       : "";
}

void add_rows(Table& table, const char* kind, const Pairs& pairs) {
  constexpr std::size_t kShown = 20;
  std::size_t shown = 0;
  for (const Pair& pair : pairs) {
    const bool is_same = pair.bytes() == 0 && pair.before && pair.after;
    if (is_same || ++shown > kShown) {
      continue;
    }
    const auto size = [](const std::optional<Count>& count) {
      return count ? size_text(count->bytes) : "-";
    };
    table.add({kind, pair.name, size(pair.before), size(pair.after), change_text(pair),
               files_text(pair), note(pair)});
  }
  if (shown > kShown) {
    table.add({kind, "and " + std::to_string(shown - kShown) + " more, see --json"});
  }
}

// Sums over shares tell of growth only where the same shares were read whole.
void warn_of_doubts(const Side& side) {
  for (const report_format::Incident& incident : side.facts.incidents) {
    const report_format::IncidentKind* kind = report_format::find_incident_kind(incident.kind);
    if (kind != nullptr && kind->spoils_sums) {
      warn("report " + side.report.name + ": " +
           english().incident(report_format::TextForm::plain, incident));
    }
  }
}

void print_as_table(const Side& from, const Side& to) {
  Table table({{"KIND"},
               {"NAME"},
               {"BEFORE", Table::Align::right},
               {"AFTER", Table::Align::right},
               {"CHANGE", Table::Align::right},
               {"FILES", Table::Align::right},
               {"NOTE"}});
  for (const Group& group : kGroups) {
    if (const auto pairs = paired(group, from.facts, to.facts)) {
      add_rows(table, group.kind, *pairs);
    }
  }
  warn_of_doubts(from);
  warn_of_doubts(to);
  if (table.empty()) {
    warn("nothing changed between " + from.report.name + " and " + to.report.name);
  } else {
    print_line("from " + from.report.name + " to " + to.report.name);
    table.print();
  }
}

void print_as_json(const Options& options, const Side& from, const Side& to) {
  Json json{{"profile", options.profile},
            {"from", ctl::json_of(from.report, from.facts)},
            {"to", ctl::json_of(to.report, to.facts)}};
  for (const Group& group : kGroups) {
    json[group.key] = nullptr;
    if (const auto pairs = paired(group, from.facts, to.facts)) {
      json[group.key] = Json::array();
      for (const Pair& pair : *pairs) {
        json[group.key].push_back(json_of(pair));
      }
    }
  }
  print_json(json);
}

// --- The command --------------------------------------------------------------------------------

Side side_of(const Options& options, const Reports& reports, const std::string& date) {
  Side side{find_report(options.profile, reports, date), {}};
  auto facts = facts_of(side.report);
  if (!facts) {
    throw Failure("report " + side.report.name +
                  " has no report.json that can be read; compare another one");
  }
  side.facts = std::move(*facts);
  return side;
}

void compare(const Options& options) {
  const std::string folder = folder_of_reports(read_profile(options.profile));
  const Reports reports = reports_in(folder, ReportSize::measured);
  Side from = side_of(options, reports, options.from);
  Side to = side_of(options, reports, options.to);
  if (from.report.name == to.report.name) {
    throw Failure("both dates name the report " + from.report.name + "; see vornctl reports " +
                  options.profile);
  }
  if (from.report.made > to.report.made) {
    std::swap(from, to);
  }
  options.json ? print_as_json(options, from, to) : print_as_table(from, to);
}

}  // namespace

void add_compare_command(CLI::App& reports) {
  const auto options = std::make_shared<Options>();
  CLI::App& command = *reports.add_subcommand("compare", "Print what grew between two reports");
  add_profile_argument(command, options->profile);
  command.add_option("DATE", options->from, "The newest whose name begins so")
      ->type_name("")
      ->required();
  command.add_option("DATE2", options->to, "The other one (default: the newest)")->type_name("");
  add_json_flag(command, options->json);
  command.callback([options] { compare(*options); });
}

}  // namespace ctl
