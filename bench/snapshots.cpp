// Measures the snapshots of two years of daily reports: how large the history gets, and what they
// cost a run, without users' quotas or with those of so many. To be run in the sandbox, whose
// history it fills:
//
//   cmake --build build --target snapshots_bench vornreport
//   DESTDIR=$PWD/build/bench-stage cmake --install build
//   tools/sandbox.sh --stage build/bench-stage -- build/snapshots_bench [USERS]
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <string>

#include "db_snapshots.hpp"
#include "facts/growth.hpp"
#include "facts/run_facts.hpp"
#include "facts/snapshot.hpp"
#include "vorn/paths.h"

namespace {

using namespace vornreport;

constexpr int64_t kDay = 86400;
constexpr int64_t kDays = 760;
constexpr int64_t kNow = 1'800'000'000;
constexpr size_t kShares = 40, kOwners = 500, kPairs = 4000, kTypes = 21, kFolders = 10'000;

size_t g_users = 0;

// A file server's names are this long, and its numbers.
Snapshot set_of(int64_t time) {
  constexpr uint64_t kSize = 123'456'789;
  const auto grown = static_cast<uint64_t>(time % 1'000'003);
  Snapshot set;
  set.time = time;
  set.owners_among = "";
  set.has_types = true;
  for (size_t i = 0; i < kShares; ++i) {
    SnapshotShare share{"department-" + std::to_string(i), true, true, {}, {}};
    SnapshotPart part{
        "/srv/volume" + std::to_string(i % 4), {10'000, kSize * 1000 + grown}, {}, {}};
    for (size_t n = 0; n < kPairs / kShares; ++n) {
      part.owners["firstname.lastname" + std::to_string((i * 37 + n) % kOwners)] = {n,
                                                                                    kSize + grown};
    }
    for (size_t n = 0; n < kTypes; ++n) {
      part.types["reportUI_file_type_" + std::to_string(n)] = {n * 100, kSize * n + grown};
    }
    for (size_t n = 0; n < kFolders / kShares; ++n) {
      share.folders.push_back(
          {"projects 2024/customer " + std::to_string(n / 9) + "/drawings/" + std::to_string(n),
           part.volume,
           {n, kSize * (n + 1) + grown}});
    }
    share.parts.push_back(std::move(part));
    set.shares.push_back(std::move(share));
  }
  for (size_t i = 0; i < g_users; ++i) {
    set.quotas.push_back({"/srv/volume" + std::to_string(i % 4),
                          "firstname.lastname" + std::to_string(i), kSize * i + grown,
                          kSize << 20U});
  }
  return set;
}

std::vector<report_format::QuotaFacts> told_users(const Snapshot& set) {
  QuotaTally tally;
  for (const SnapshotQuota& user : set.quotas) {
    tally.add(user.volume, user.user, user.used, user.quota);
  }
  return tally.users();
}

// What a run does with snapshots. False when something failed.
bool run_at(int64_t now) {
  const Snapshot set = set_of(now);
  const auto times = SnapshotTimes("p");
  if (!times) {
    return false;
  }
  const GrowthBases bases = growth_bases(*times, now);
  for (const auto& base : {bases.last, bases.week, bases.month}) {
    if (base) {
      const auto then = SnapshotRead("p", *base);
      if (!then || greatest_changes({"", *base, changes_between(*then, set)}).empty()) {
        return false;
      }
    }
  }
  return SnapshotStorePending("p", set) && SnapshotSamplesOf("p", now, told_users(set)) &&
         SnapshotMarkValid("p", now, now);
}

}  // namespace

int main(int argc, char** argv) {
  using Clock = std::chrono::steady_clock;
  g_users = argc > 1 ? std::stoul(argv[1]) : 0;
  std::filesystem::remove(VORN_PATH_HISTORY_DB);
  double longest = 0;
  double sum = 0;
  constexpr int64_t kMeasured = 60;
  for (int64_t day = kDays; day >= 0; --day) {
    const auto begin = Clock::now();
    if (!run_at(kNow - day * kDay)) {
      std::fprintf(stderr, "the run of %lld days ago failed\n", static_cast<long long>(day));
      return 1;
    }
    const double seconds = std::chrono::duration<double>(Clock::now() - begin).count();
    if (day < kMeasured) {
      longest = std::max(longest, seconds);
      sum += seconds;
    }
  }
  std::printf("%zu sets, %.1f MiB, %.3f s a run, %.3f s at most\n", SnapshotTimes("p")->size(),
              static_cast<double>(std::filesystem::file_size(VORN_PATH_HISTORY_DB)) / (1 << 20),
              sum / kMeasured, longest);
}
