// The snapshots of each profile's finished reports, in the history database. A set is stored while
// its run isn't finished yet, and counts from when it is marked as valid.
//
// Every operation opens the database and closes it again; a database that was made before there
// were snapshots gets their table then. What fails is logged, and is an incident "history_lost"
// once a run, as long as the run's facts are open.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "facts/snapshot.hpp"

namespace vornreport {

// How many folders a set keeps, first and once it is older than the 40 days of which all sets stay.
inline constexpr size_t kMostFolders = 2000;
inline constexpr size_t kMostOldFolders = 500;
// How long a set keeps users with their quotas. Samples are asked for no longer: 90 calendar days
// begin somewhere in the day before.
inline constexpr int64_t kSampleDays = 91;

// Stores a set, its folders cut to kMostFolders, in the place of what the profile's earlier runs
// have left unfinished. False when it isn't stored.
bool SnapshotStorePending(const std::string& profile, Snapshot set);

// Makes the profile's set of `time` count, in the place of one of the same second, and thins out:
// all sets of the last 40 days stay, of older ones the first of each week, with their largest
// folders, without users beyond kSampleDays; of all profiles those older than two years go. Times
// after `now`, of a clock that was ahead, stay until they are past; and a clock is believed only a
// week ahead of five days on which reports were finished, so that a wrong one thins out nothing.
// False when the set doesn't count, as when it isn't there.
bool SnapshotMarkValid(const std::string& profile, int64_t time, int64_t now);

// Removes the set that the profile's run of `time` has stored, whether it counts or not.
void SnapshotDrop(const std::string& profile, int64_t time);

// The times of the sets that count, oldest first. Nothing when they can't be read.
std::optional<std::vector<int64_t>> SnapshotTimes(const std::string& profile);

// The set of `time`. Nothing when there is none that counts, or none that can be read.
std::optional<Snapshot> SnapshotRead(const std::string& profile, int64_t time);

// What the sets of the kSampleDays before `until` saw of the shares, and of `users` on their
// volumes. Nothing when they can't be read.
std::optional<SnapshotSamples> SnapshotSamplesOf(
    const std::string& profile, int64_t until, const std::vector<report_format::QuotaFacts>& users);

}  // namespace vornreport
