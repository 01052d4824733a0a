#include "ship.hpp"

#include <sqlite3.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <deque>
#include <functional>
#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "db_snapshots.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "report_format/facts_file.hpp"
#include "report_format/fleet.hpp"
#include "report_format/reports.hpp"
#include "vorn/fleet.h"
#include "vorn/report.h"
#include "vorn/user.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fleet_rows.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/fleet";
constexpr size_t kRowsOfBatch = 100'000;
// What an engine on this machine's two cores reads at once beside what is sent.
constexpr size_t kBatchesBeside = 2;
constexpr int kAttempts = 2;
// The report waits for it.
constexpr std::chrono::minutes kLongestSending(30);

using report_format::append_binary_number;
using report_format::append_binary_text;
using report_format::append_fleet_text;

// A sent run that waits for its line.
struct Sent {
  FleetHandle fleet;
  std::string prefix;    // what its line begins with
  int64_t interval = 0;  // seconds since the run before; 0 when that isn't known
  uint64_t rows = 0;
};
std::optional<Sent> g_sent;
std::chrono::steady_clock::time_point g_sending_ends;

bool has_time() {
  return std::chrono::steady_clock::now() < g_sending_ends;
}

// The number under which one attempt's rows stand; see report_format/fleet.hpp.
uint64_t new_run_number() {
  return static_cast<uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(
                                   std::chrono::system_clock::now().time_since_epoch())
                                   .count());
}

// What each of an attempt's rows begins with.
std::string prefix_of(const VORNFleet* fleet, uint64_t run) {
  std::string prefix;
  append_fleet_text(prefix, VORNFleetServer(fleet));
  prefix += '\t';
  append_fleet_text(prefix, run_facts().profile);
  return prefix + '\t' + std::to_string(run) + '\t';
}
std::string binary_prefix_of(const VORNFleet* fleet, uint64_t run) {
  std::string prefix;
  append_binary_text(prefix, VORNFleetServer(fleet));
  append_binary_text(prefix, run_facts().profile);
  append_binary_number(prefix, run);
  return prefix;
}

void append_number(std::string& out, int64_t value) {
  std::array<char, 24> digits;
  out.append(digits.data(), std::to_chars(digits.data(), digits.data() + digits.size(), value).ptr);
}

// --- Rows, one after another ---------------------------------------------------------------------

enum class Next : uint8_t { kRow, kEnd, kFailed };
// Appends the next row to `out`.
using NextRow = std::function<Next(std::string& out)>;

// Rows that several batches take from. Once there are no more, nothing is asked again.
class Rows {
 public:
  explicit Rows(NextRow next) : next_(std::move(next)) {}

  bool append_next(std::string& out) {
    last_ = last_ == Next::kRow ? next_(out) : last_;
    count_ += last_ == Next::kRow ? 1 : 0;
    return last_ == Next::kRow;
  }
  bool have_failed() const { return last_ == Next::kFailed; }
  uint64_t count() const { return count_; }

 private:
  const NextRow next_;
  Next last_ = Next::kRow;
  uint64_t count_ = 0;
};

// A batch of rows as the bytes that the platform asks for.
class Batch {
 public:
  // `first` is its first row: it was asked for to see whether there is one.
  Batch(Rows& rows, std::string first) : rows_(rows), pending_(std::move(first)) {}

  size_t read(char* out, size_t size) {
    pending_.erase(0, std::exchange(at_, 0));  // less than a row is left of the last time
    while (pending_.size() < size && count_ < kRowsOfBatch && rows_.append_next(pending_)) {
      ++count_;
    }
    at_ = pending_.copy(out, size);
    return at_;
  }

 private:
  Rows& rows_;
  std::string pending_;
  size_t at_ = 0;  // what of it has been read
  size_t count_ = 1;
};

// All rows, batch by batch, and several beside each other when there are many. An engine that takes
// a batch takes all of it. `sent` grows by their number.
bool send(VORNFleet* fleet, const char* table, VORNFleetFormat format, NextRow next,
          uint64_t& sent) {
  Rows rows(std::move(next));
  const auto source = [](void* context, char* out, size_t size) {
    return static_cast<Batch*>(context)->read(out, size);
  };
  for (size_t beside = 1; has_time(); beside = kBatchesBeside) {
    std::deque<Batch> batches;
    std::vector<void*> contexts;
    for (std::string first; batches.size() < beside && rows.append_next(first); first.clear()) {
      contexts.push_back(&batches.emplace_back(rows, std::move(first)));
    }
    const bool was_sent =
        contexts.empty() ||
        VORNFleetInsert(fleet, table, format, source, contexts.data(), contexts.size()) == 0;
    if (!was_sent || rows.have_failed()) {
      return false;
    }
    if (contexts.empty()) {
      sent += rows.count();
      return true;
    }
  }
  return false;
}

// --- Files ---------------------------------------------------------------------------------------

using Statement = std::unique_ptr<sqlite3_stmt, ReleaseWith<&sqlite3_finalize>>;

// The rows of the statistics database in their order.
class FileRows {
 public:
  FileRows(const VLIBCSzHash* profile_hash, const VLIBCSzHash* users, std::string prefix)
      : users_(users), prefix_(std::move(prefix)) {
    const char* list = set_value(profile_hash, "report_list");
    tells_owners_ =
        list != nullptr && report_format::is_selected(report_format::kFileOwner.name, list);
    const char* path = set_value(profile_hash, "real_path_stat_db");
    is_absent_ = path == nullptr || access(path, F_OK) != 0;
    db_ = is_absent_ ? nullptr : open_further(path);
    sqlite3_stmt* made = nullptr;
    if (db_ &&
        sqlite3_prepare_v2(
            db_.get(), "select id, owner, mtime, size, share, path, filename, ext from file_stat",
            -1, &made, nullptr) != SQLITE_OK) {
      REPORT_LOG_ERR(kModule, __LINE__, "%s\n", sqlite3_errmsg(db_.get()));
    }
    rows_.reset(made);
  }

  Next next(std::string& out) {
    if (is_absent_) {
      return Next::kEnd;  // nothing was gathered
    }
    const int result = rows_ ? sqlite3_step(rows_.get()) : SQLITE_ERROR;
    if (result != SQLITE_ROW) {
      if (result != SQLITE_DONE) {
        REPORT_LOG_ERR(kModule, __LINE__, "rows can't be read: %s\n",
                       db_ ? sqlite3_errmsg(db_.get()) : "no database");
      }
      return result == SQLITE_DONE ? Next::kEnd : Next::kFailed;
    }
    append(out);
    return Next::kRow;
  }

 private:
  enum Column { kId, kOwner, kTime, kSize, kShare, kPath, kName, kType };

  void append(std::string& out) {
    out += prefix_;
    number(out, kId);
    number(out, kOwner);
    append_binary_text(out, owner_name(sqlite3_column_int64(rows_.get(), kOwner)));
    number(out, kTime);
    number(out, kSize);
    text(out, kShare);
    text(out, kPath);
    const int type = sqlite3_column_type(rows_.get(), kName);
    const double value = type == SQLITE_INTEGER || type == SQLITE_FLOAT
                             ? sqlite3_column_double(rows_.get(), kName)
                             : std::numeric_limits<double>::infinity();
    text(out, kName);
    append_binary_number(out, value);
    text(out, kType);
  }

  void number(std::string& out, Column column) {
    append_binary_number(out, int64_t{sqlite3_column_int64(rows_.get(), column)});
  }

  void text(std::string& out, Column column) {
    const auto* bytes = sqlite3_column_text(rows_.get(), column);
    append_binary_text(out, {reinterpret_cast<const char*>(bytes),
                             static_cast<size_t>(sqlite3_column_bytes(rows_.get(), column))});
  }

  // Empty for one that reports don't tell.
  const std::string& owner_name(int64_t id) {
    const auto [place, is_new] = names_.try_emplace(id);
    VORNUser* user = nullptr;
    if (is_new && tells_owners_ && VORNUserGetByUID(static_cast<uid_t>(id), &user) >= 0) {
      const UserHandle owned(user);
      if (user != nullptr && !is_unset(user->name) &&
          VLIBCSzHashGetValue(users_, user->name) != nullptr) {
        place->second = user->name;
      }
    }
    return place->second;
  }

  const VLIBCSzHash* users_;
  const std::string prefix_;
  bool tells_owners_ = false, is_absent_ = false;
  SqliteHandle db_;
  Statement rows_;
  std::unordered_map<int64_t, std::string> names_;
};

// --- What was kept -------------------------------------------------------------------------------

NextRow lines_of(FILE* file, const std::string& prefix) {
  return [file, &prefix](std::string& out) {
    const size_t before = out.size();
    out += prefix;
    std::array<char, 4096> piece;
    while (std::fgets(piece.data(), static_cast<int>(piece.size()), file) != nullptr) {
      out += piece.data();
      if (out.back() == '\n') {
        return Next::kRow;
      }
    }
    out.resize(before);
    return std::ferror(file) != 0 ? Next::kFailed : Next::kEnd;
  };
}

// What the names of the shares stand for.
void keep_shares(const ShipLookUps& look_ups) {
  for (const ShareTally& share : tallies().shares()) {
    const char* folder = VLIBCSzHashGetValue(look_ups.shares, share.name().c_str());
    const char* volume = VLIBCSzHashGetValue(look_ups.volumes, share.name().c_str());
    keep_fleet_row(
        "share", {share.name(), folder != nullptr ? folder : "", volume != nullptr ? volume : ""});
  }
}

// --- A run ---------------------------------------------------------------------------------------

bool send_rows(VORNFleet* fleet, uint64_t run, const VLIBCSzHash* profile_hash,
               const VLIBCSzHash* users, uint64_t& sent) {
  FILE* rows = kept_report_rows();
  FILE* members = kept_content_members();
  if (rows == nullptr || members == nullptr) {
    return false;
  }
  const std::string prefix = prefix_of(fleet, run);
  FileRows files(profile_hash, users, binary_prefix_of(fleet, run));
  const NextRow next_file = [&](std::string& out) { return files.next(out); };
  return send(fleet, report_format::kFleetFile.name, VORN_FLEET_BINARY, next_file, sent) &&
         send(fleet, report_format::kFleetRow.name, VORN_FLEET_TEXT, lines_of(rows, prefix),
              sent) &&
         send(fleet, report_format::kFleetContent.name, VORN_FLEET_TEXT, lines_of(members, prefix),
              sent);
}

void tell(const VORNFleet* fleet) {
  std::string problem = VORNFleetProblem(fleet);
  if (!has_time()) {
    problem = "its rows weren't taken within " + std::to_string(kLongestSending.count()) +
              " minutes; see to the engine and the way to it";
  } else if (problem.empty()) {
    problem = "its rows can't be read; the log says why";
  }
  record_incident("fleet_unreachable", "fleet", "this run is missing from the fleet: " + problem);
}

// The longest time that has lately passed between two of the profile's runs; 0 for its first.
int64_t interval_of_runs() {
  constexpr size_t kLooksBack = 3;
  std::vector<int64_t> times = SnapshotTimes(run_facts().profile).value_or(std::vector<int64_t>{});
  std::erase_if(times, [](int64_t time) { return time >= run_facts().started; });
  times.push_back(run_facts().started);
  int64_t longest = 0;
  for (size_t i = times.size() - 1; i > 0 && i + kLooksBack >= times.size(); --i) {
    longest = std::max(longest, times[i] - times[i - 1]);
  }
  return longest;
}

// The one row of the run's line.
NextRow line_of(std::string row) {
  return [row = std::move(row), is_done = false](std::string& out) mutable {
    if (std::exchange(is_done, true)) {
      return Next::kEnd;
    }
    out += row;
    return Next::kRow;
  };
}

}  // namespace

void ship_rows(const VLIBCSzHash* profile_hash, const ShipLookUps& look_ups) {
  if (!keeps_fleet_rows()) {
    return;
  }
  g_sending_ends = std::chrono::steady_clock::now() + kLongestSending;
  keep_shares(look_ups);
  VORNFleet* opened = nullptr;
  const int found = VORNFleetOpen(&opened);
  FleetHandle fleet(opened);
  if (found > 0) {
    record_incident("fleet_unreachable", "fleet",
                    "this run is missing from the fleet: no engine is configured; run vornctl "
                    "fleet set, or remove fleet = true from the profile");
    return;
  }
  for (int attempt = 0; found == 0 && attempt < kAttempts; ++attempt) {
    const uint64_t run = new_run_number();
    uint64_t sent = 0;
    if (send_rows(fleet.get(), run, profile_hash, look_ups.users, sent)) {
      std::string prefix = prefix_of(fleet.get(), run);
      g_sent = Sent{std::move(fleet), std::move(prefix), interval_of_runs(), sent};
      return;
    }
  }
  tell(fleet.get());
}

void ship_run(const char* facts_path) {
  if (!g_sent) {
    return;
  }
  const std::string path = facts_path;
  const auto facts = report_format::read_facts(path.substr(0, path.rfind('/')));
  if (!facts) {
    return;  // the run fails over it
  }
  uint64_t files = 0;
  uint64_t bytes = 0;
  for (const ShareTally& share : tallies().shares()) {
    files += share.total().files;
    bytes += share.total().bytes;
  }
  std::string row = g_sent->prefix;
  for (const int64_t value :
       {facts->started, facts->finished, static_cast<int64_t>(files), static_cast<int64_t>(bytes),
        g_sent->interval, static_cast<int64_t>(g_sent->rows)}) {
    append_number(row, value);
    row += '\t';
  }
  append_fleet_text(row, report_format::to_line(*facts));
  row += '\n';
  g_sending_ends = std::chrono::steady_clock::now() + kLongestSending;
  for (int attempt = 0; attempt < kAttempts; ++attempt) {
    if (uint64_t sent = 0; send(g_sent->fleet.get(), report_format::kFleetRun.name, VORN_FLEET_TEXT,
                                line_of(row), sent)) {
      return;
    }
  }
  REPORT_LOG_ERR(kModule, __LINE__, "this run is missing from the fleet: %s\n",
                 VORNFleetProblem(g_sent->fleet.get()));
  VornQazStatusFleetFailed();
}

}  // namespace vornreport
