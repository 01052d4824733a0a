// What all servers of a fleet and its engine agree on: the tables, and how a text is written.
#pragma once

#include <array>
#include <bit>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>
#include <tuple>
#include <type_traits>
#include <vector>

namespace report_format {

// A run's rows carry the server, the profile and a number of the run that grows: the time at which
// they began to be shipped, in microseconds. So rows of two shippings of one run stay apart, and of
// two runs of one second the later one has the greater number.
struct FleetTable {
  const char* name;
  // Behind `server String, profile String, run UInt64`, in the order in which they are shipped.
  const char* columns;
  const char* order;  // of a run's rows on disk
};
inline constexpr std::uint64_t kRunsInSecond = 1'000'000;

// A row for every file. A name that SQLite keeps as a number sorts by it, before all others.
inline constexpr FleetTable kFleetFile{
    "file",
    "id Int64, owner Int64, owner_name String, mtime Int64, size Int64, share String, path String, "
    "filename String, filename_number Float64, ext String",
    "id"};
// The rows of the reports that aren't made of files, in their order; and, as those of "share", what
// the names of shares stand for: share, folder, volume.
inline constexpr FleetTable kFleetRow{
    "report_row", "report String, position UInt64, value Array(String)", "report, position"};
// The members of the groups that a comparison of contents has found, in their order.
inline constexpr FleetTable kFleetContent{
    "content_group",
    "number UInt64, position UInt64, share String, path String, size Int64, mtime Int64",
    "position"};
// The run itself, which counts once its line is there and, where replicas are behind, `row_count`
// rows of the other tables. `since_last`: seconds since the run before; `report`: its facts.
inline constexpr FleetTable kFleetRun{
    "run",
    "started Int64, finished Int64, files UInt64, bytes UInt64, since_last Int64, "
    "row_count UInt64, report String",
    "run"};
inline constexpr std::array kFleetTables{&kFleetFile, &kFleetRow, &kFleetContent, &kFleetRun};

// "id, owner, …": the names of `table.columns`.
std::string fleet_column_names(const FleetTable& table);

// In a cluster each node keeps its part of a table under the name with this behind it.
inline constexpr std::string_view kFleetPart = "_part";

// `text` for a field of the engine's TabSeparated format and for the inside of a literal in single
// quotes, in which it is data whatever it holds.
void append_fleet_text(std::string& out, std::string_view text);
std::string fleet_literal(std::string_view text);  // with the quotes

// Values of the engine's RowBinary format.
void append_binary_text(std::string& out, std::string_view text);
template <typename Number>
void append_binary_number(std::string& out, Number value) {
  static_assert(std::is_arithmetic_v<Number> && std::endian::native == std::endian::little);
  char bytes[sizeof value];
  std::memcpy(bytes, &value, sizeof value);
  out.append(bytes, sizeof value);
}

// A row of the TabSeparated format, without its line end, taken apart in place: each of `fields`
// ends with a NUL; that of an absent value is null.
void split_fleet_row(std::string& row, std::vector<char*>& fields);

// A partition as the engine writes it: ('server','profile',17).
struct FleetPartition {
  std::string server, profile;
  std::uint64_t run = 0;
  bool operator<(const FleetPartition& other) const {
    return std::tie(server, profile, run) < std::tie(other.server, other.profile, other.run);
  }
  bool operator==(const FleetPartition& other) const = default;
};
// False when `text` is none.
bool read_partition(std::string_view text, FleetPartition& partition);

// The values of a list in a field.
std::string fleet_list(const std::vector<std::string>& values);

// A run is overdue a day after the time that its profile usually takes between two has passed.
bool is_overdue(std::int64_t started, std::int64_t interval, std::int64_t now);

}  // namespace report_format
