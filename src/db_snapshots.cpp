#include "db_snapshots.hpp"

#include <algorithm>
#include <cstdlib>

#include "facts/run_facts.hpp"
#include "history_db.hpp"
#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/db_snapshots";
constexpr int64_t kDay = 86400;
constexpr int64_t kAllDays = 40;
constexpr int64_t kMostDays = 730;

// As in the schema, for databases that are older than this table. The long text comes last, so that
// who doesn't ask for it needn't read through it. `folders` is the number of them in `details`.
//
// A pending set stands at its time below zero: two runs can begin in one second, and the second one
// must not cost the first one's set unless it finishes as well.
constexpr char kTable[] =
    "CREATE TABLE IF NOT EXISTS Snapshot (\n"
    "  profile TEXT NOT NULL,\n"
    "  time INTEGER NOT NULL,\n"
    "  valid INTEGER NOT NULL,\n"
    "  folders INTEGER NOT NULL,\n"
    "  summary TEXT NOT NULL,\n"
    "  details TEXT NOT NULL,\n"
    "  PRIMARY KEY (profile, time)\n"
    ")";

void tell_lost(const char* what) {
  record_incident("history_lost", "snapshot", std::string(what) + "; the log says why",
                  AlreadyLogged::kYes);
}
constexpr char kNotStored[] =
    "the snapshot of this run can't be stored, so later runs can't tell what has grown since it";
constexpr char kNoneRead[] =
    "the snapshots of earlier runs can't be read, so growth since them isn't told";

// The history with its table, for the sets of one profile.
class Snapshots {
 public:
  explicit Snapshots(const std::string& profile)
      : db_(open_history(kModule, __LINE__)), profile_(quoted(profile)) {
    is_ready_ = db_ && run(kTable);
  }
  bool is_ready() const { return is_ready_; }

  bool run(const std::string& sql) {
    ResultHandle none;
    return select(sql, none);
  }
  // False, logged, on failure.
  bool select(const std::string& sql, ResultHandle& result) {
    constexpr size_t kShown = 200;
    if (execute(db_.get(), sql.c_str(), result)) {
      return true;
    }
    REPORT_LOG_ERR(kModule, __LINE__, "Failed to use the snapshots, sql=%s\n",
                   sql.substr(0, kShown).c_str());
    return false;
  }
  // Calls `take` with each row of `sql`. False, logged, on failure.
  template <typename Take>
  bool each(const std::string& sql, Take&& take) {
    ResultHandle result;
    if (!select(sql, result)) {
      return false;
    }
    VORNDBRow* row = nullptr;
    while (result && VORNDBFetchRow(result.get(), &row) != -1) {
      take([&](const char* column) { return field(result.get(), row, column); });
    }
    return true;
  }

  // " WHERE" and a condition for the profile's own.
  std::string own() const { return " WHERE profile = " + profile_; }
  const std::string& profile() const { return profile_; }
  std::string quoted(const std::string& text) const {
    std::string out(text.size() * 2 + 1, '\0');
    if (!db_ ||
        VORNDBEscapeStringEX(db_.get(), out.data(), out.size(), text.data(), text.size()) == 0) {
      return "''";
    }
    out.resize(out.find('\0'));
    return "'" + out + "'";
  }

 private:
  DbHandle db_;
  std::string profile_;
  bool is_ready_ = false;
};

constexpr char kPending[] = " AND valid = 0";
constexpr char kValid[] = " AND valid = 1";

std::string at(int64_t time) {
  return " AND time = " + std::to_string(time);
}

int64_t to_time(const char* text) {
  return std::strtoll(text, nullptr, 10);
}

std::optional<Snapshot> checked(std::optional<Snapshot> set, int64_t time) {
  if (!set) {
    REPORT_LOG_ERR(kModule, __LINE__,
                   "the snapshot of %lld is damaged or of another version; it is left aside\n",
                   static_cast<long long>(time));
  }
  return set;
}

// The set keeps what it has, but for its smaller folders and users that nobody asks for any more.
void cut(Snapshots& history, int64_t time, const SnapshotText& text, int64_t now) {
  std::optional<Snapshot> set = checked(snapshot_of(time, text), time);
  if (!set) {
    history.run("DELETE FROM Snapshot" + history.own() + at(time));
    return;
  }
  set->cut_folders(kMostOldFolders);
  if (time < now - kSampleDays * kDay) {
    set->quotas.clear();
  }
  const SnapshotText kept = to_text(*set);
  history.run("UPDATE Snapshot SET folders = " + std::to_string(set->folder_count()) +
              ", summary = " + history.quoted(kept.summary) +
              ", details = " + history.quoted(kept.details) + history.own() + at(time));
}

// The time that ages are seen from: `now`, but no more than a week beyond the day that is the fifth
// with finished reports, counted back from it. A clock that is years ahead has no such days, and
// for it all sets would be old. Nothing while there are fewer days.
std::optional<int64_t> trusted_time(Snapshots& history, int64_t now) {
  constexpr int64_t kDays = 5, kAhead = 7 * kDay;
  std::optional<int64_t> trusted;
  history.each(
      "SELECT max(time) AS newest FROM Snapshot WHERE valid = 1 AND time <= " +
          std::to_string(now) + " GROUP BY time / " + std::to_string(kDay) +
          " ORDER BY newest DESC LIMIT 1 OFFSET " + std::to_string(kDays - 1),
      [&](const auto& column) { trusted = std::min(now, to_time(column("newest")) + kAhead); });
  return trusted;
}

void thin_out(Snapshots& history, int64_t now) {
  const std::string old =
      history.own() + kValid + " AND time < " + std::to_string(now - kAllDays * kDay);
  history.run("DELETE FROM Snapshot WHERE abs(time) < " + std::to_string(now - kMostDays * kDay));
  history.run("DELETE FROM Snapshot" + old + " AND time NOT IN (SELECT min(time) FROM Snapshot" +
              old + " GROUP BY time / " + std::to_string(7 * kDay) + ")");
  std::vector<int64_t> large;
  history.each("SELECT time FROM Snapshot" + old + " AND (folders > " +
                   std::to_string(kMostOldFolders) + " OR (time < " +
                   std::to_string(now - kSampleDays * kDay) +
                   " AND instr(summary, char(10) || 'q' || char(9)) > 0))",
               [&](const auto& column) { large.push_back(to_time(column("time"))); });
  for (const int64_t time : large) {
    SnapshotText text;
    history.each("SELECT summary, details FROM Snapshot" + history.own() + at(time),
                 [&](const auto& column) {
                   text = {column("summary"), column("details")};
                 });
    cut(history, time, text, now);
  }
}

}  // namespace

bool SnapshotStorePending(const std::string& profile, Snapshot set) {
  Snapshots history(profile);
  set.cut_folders(kMostFolders);
  const SnapshotText text = to_text(set);
  const bool is_stored =
      history.is_ready() && history.run("DELETE FROM Snapshot" + history.own() + kPending) &&
      history.run(
          "INSERT OR REPLACE INTO Snapshot (profile, time, valid, folders, summary, "
          "details) VALUES (" +
          history.profile() + ", " + std::to_string(-set.time) + ", 0, " +
          std::to_string(set.folder_count()) + ", " + history.quoted(text.summary) + ", " +
          history.quoted(text.details) + ")");
  if (!is_stored) {
    tell_lost(kNotStored);
  }
  return is_stored;
}

bool SnapshotMarkValid(const std::string& profile, int64_t time, int64_t now) {
  Snapshots history(profile);
  const std::string pending = history.own() + kPending + at(-time);
  bool is_there = false;
  if (!history.is_ready() ||
      !history.each("SELECT time FROM Snapshot" + pending, [&](auto&&) { is_there = true; }) ||
      !is_there ||
      !history.run("UPDATE OR REPLACE Snapshot SET time = -time, valid = 1" + pending)) {
    return false;
  }
  if (const auto trusted = trusted_time(history, now)) {
    thin_out(history, *trusted);
  }
  return true;
}

void SnapshotDrop(const std::string& profile, int64_t time) {
  if (Snapshots history(profile); history.is_ready()) {
    history.run("DELETE FROM Snapshot" + history.own() +
                " AND time = (SELECT min(time) FROM Snapshot" + history.own() +
                " AND (valid = 0 OR time = " + std::to_string(time) + "))");
  }
}

std::optional<std::vector<int64_t>> SnapshotTimes(const std::string& profile) {
  Snapshots history(profile);
  std::vector<int64_t> times;
  if (!history.is_ready() ||
      !history.each("SELECT time FROM Snapshot" + history.own() + kValid + " ORDER BY time",
                    [&](const auto& column) { times.push_back(to_time(column("time"))); })) {
    tell_lost(kNoneRead);
    return std::nullopt;
  }
  return times;
}

std::optional<Snapshot> SnapshotRead(const std::string& profile, int64_t time) {
  Snapshots history(profile);
  std::optional<SnapshotText> text;
  if (!history.is_ready() ||
      !history.each("SELECT summary, details FROM Snapshot" + history.own() + kValid + at(time),
                    [&](const auto& column) {
                      text.emplace(SnapshotText{column("summary"), column("details")});
                    })) {
    tell_lost(kNoneRead);
    return std::nullopt;
  }
  std::optional<Snapshot> set = text ? checked(snapshot_of(time, *text), time) : std::nullopt;
  if (text && !set) {
    tell_lost(kNoneRead);
  }
  return set;
}

std::optional<SnapshotSamples> SnapshotSamplesOf(
    const std::string& profile, int64_t until,
    const std::vector<report_format::QuotaFacts>& users) {
  Snapshots history(profile);
  SnapshotSamples samples;
  for (const report_format::QuotaFacts& user : users) {
    samples.users[{user.volume, user.user}];
  }
  std::vector<int64_t> times;
  bool is_read =
      history.is_ready() &&
      history.each("SELECT time FROM Snapshot" + history.own() + kValid +
                       " AND time >= " + std::to_string(until - kSampleDays * kDay) +
                       " AND time <= " + std::to_string(until) + " ORDER BY time",
                   [&](const auto& column) { times.push_back(to_time(column("time"))); });
  // One by one: a set holds every user.
  for (size_t i = 0; is_read && i < times.size(); ++i) {
    is_read = history.each(
        "SELECT summary FROM Snapshot" + history.own() + kValid + at(times[i]),
        [&](const auto& column) {
          if (const auto set = checked(snapshot_of(times[i], {column("summary"), ""}), times[i])) {
            samples.add(*set);
          }
        });
  }
  if (!is_read) {
    tell_lost(kNoneRead);
    return std::nullopt;
  }
  return samples;
}

}  // namespace vornreport
