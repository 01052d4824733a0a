#include "facts/growth.hpp"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <iterator>
#include <map>
#include <string_view>
#include <tuple>
#include <unordered_map>
#include <utility>

namespace vornreport {
namespace {

constexpr int64_t kDay = 86400;

// Of the times from `oldest` to `youngest` days before `now` the nearest to `wanted`.
std::optional<int64_t> nearest(std::span<const int64_t> times, int64_t now, int64_t wanted,
                               int64_t youngest, int64_t oldest) {
  std::optional<int64_t> found;
  const auto distance = [&](int64_t time) {
    return std::pair(std::abs(now - time - wanted * kDay), -time);
  };
  for (const int64_t time : times) {
    if (time <= now - youngest * kDay && time >= now - oldest * kDay &&
        (!found || distance(time) < distance(*found))) {
      found = time;
    }
  }
  return found;
}

// `now` less `then`.
int64_t difference(uint64_t then, uint64_t now) {
  constexpr uint64_t kMost = INT64_MAX;
  return now >= then ? static_cast<int64_t>(std::min(now - then, kMost))
                     : -static_cast<int64_t>(std::min(then - now, kMost));
}

uint64_t magnitude(int64_t value) {
  return value < 0 ? 0 - static_cast<uint64_t>(value) : static_cast<uint64_t>(value);
}

Change change(GrowthKind kind, const std::string& share, const std::string& volume,
              const std::string& name, const Amount& then, const Amount& now) {
  return {kind,
          share,
          volume,
          name,
          difference(then.files, now.files),
          difference(then.bytes, now.bytes)};
}

// Both kinds of folder are one.
GrowthKind group_of(GrowthKind kind) {
  return kind == GrowthKind::kFolderAtLeast ? GrowthKind::kFolder : kind;
}

auto order_of(const Change& change) {
  return std::tuple(group_of(change.kind), ~magnitude(change.bytes), ~magnitude(change.files),
                    std::string_view(change.share), std::string_view(change.name), change.kind);
}

// The folders that have changed the most: on each volume the greatest losses and the greatest
// gains. There are up to 10,000 in a set, whose paths may take 4 KiB each.
class GreatFolders {
 public:
  void add(Change change) {
    if (change.files == 0 && change.bytes == 0) {
      return;
    }
    changes_.push_back(std::move(change));
    if (changes_.size() - kept_ > kMostGathered) {
      cut();
    }
  }
  std::vector<Change> take() {
    cut();
    return std::move(changes_);
  }

 private:
  static constexpr size_t kMostGathered = 4096;

  void cut() {
    std::sort(changes_.begin(), changes_.end(),
              [](const Change& one, const Change& two) { return order_of(one) < order_of(two); });
    std::map<std::pair<std::string, bool>, size_t> counts;
    std::erase_if(changes_, [&](const Change& change) {
      return ++counts[{change.volume, change.bytes < 0}] > kMostFoldersOfVolume;
    });
    kept_ = changes_.size();
  }

  std::vector<Change> changes_;
  size_t kept_ = 0;  // by the last cut
};

// The changes of one share.
class ShareGrowth {
 public:
  ShareGrowth(const SnapshotShare& then, const SnapshotShare& now, std::vector<Change>& out)
      : then_(then), now_(now), out_(out) {}

  using Named = std::map<std::string, Amount> SnapshotPart::*;
  void add_totals() {
    for_volumes([this](const SnapshotPart& then, const SnapshotPart& now) {
      add(GrowthKind::kShare, now.volume, "", then.total, now.total);
    });
  }
  void add_named(GrowthKind kind, Named named) {
    for_volumes([&](const SnapshotPart& then, const SnapshotPart& now) {
      std::map<std::string, std::pair<Amount, Amount>> both;
      for (const auto& [name, amount] : then.*named) {
        both[name].first = amount;
      }
      for (const auto& [name, amount] : now.*named) {
        both[name].second = amount;
      }
      for (const auto& [name, amounts] : both) {
        add(kind, now.volume, name, amounts.first, amounts.second);
      }
    });
  }

  // `then_smallest` and `now_smallest`: of the sets that the shares are of.
  void add_folders(GreatFolders& out, std::optional<uint64_t> then_smallest,
                   std::optional<uint64_t> now_smallest) {
    folders_ = &out;
    std::unordered_map<std::string_view, const SnapshotFolder*> before;
    for (const SnapshotFolder& folder : then_.folders) {
      before.emplace(folder.folder, &folder);
    }
    for (const SnapshotFolder& folder : now_.folders) {
      const auto found = before.find(folder.folder);
      if (found == before.end()) {
        add_appeared(folder, then_smallest);
        continue;
      }
      add_kept(*found->second, folder);
      before.erase(found);
    }
    for (const SnapshotFolder& folder : then_.folders) {
      if (before.contains(folder.folder)) {
        add_vanished(folder, now_smallest);
      }
    }
  }

 private:
  void add(GrowthKind kind, const std::string& volume, const std::string& name, const Amount& then,
           const Amount& now) {
    out_.push_back(change(kind, now_.name, volume, name, then, now));
  }
  void add_at_least(const SnapshotFolder& folder, uint64_t then, uint64_t now) {
    folders_->add({GrowthKind::kFolderAtLeast, now_.name, folder.volume, folder.folder, 0,
                   difference(then, now)});
  }
  void add_folder(const std::string& volume, const std::string& name, const Amount& then,
                  const Amount& now) {
    folders_->add(change(GrowthKind::kFolder, now_.name, volume, name, then, now));
  }

  void add_kept(const SnapshotFolder& then, const SnapshotFolder& now) {
    if (then.volume == now.volume) {
      add_folder(now.volume, now.folder, then.amount, now.amount);
    } else {  // something was mounted there, or is no more; both halves stay
      add(GrowthKind::kFolder, then.volume, now.folder, then.amount, {});
      add(GrowthKind::kFolder, now.volume, now.folder, {}, now.amount);
    }
  }
  void add_appeared(const SnapshotFolder& folder, std::optional<uint64_t> smallest) {
    if (then_.has_all_folders) {
      add_folder(folder.volume, folder.folder, {}, folder.amount);
    } else if (smallest && folder.amount.bytes > *smallest) {
      add_at_least(folder, *smallest, folder.amount.bytes);
    }
  }
  void add_vanished(const SnapshotFolder& folder, std::optional<uint64_t> smallest) {
    if (now_.has_all_folders) {
      add_folder(folder.volume, folder.folder, folder.amount, {});
    } else if (smallest && folder.amount.bytes > *smallest) {
      add_at_least(folder, folder.amount.bytes, *smallest);
    }
  }

  template <typename Take>
  void for_volumes(Take&& take) const {
    std::map<std::string, std::pair<const SnapshotPart*, const SnapshotPart*>> both;
    for (const SnapshotPart& part : then_.parts) {
      both[part.volume].first = &part;
    }
    for (const SnapshotPart& part : now_.parts) {
      both[part.volume].second = &part;
    }
    for (const auto& [volume, parts] : both) {
      const SnapshotPart none{volume, {}, {}, {}};
      take(parts.first != nullptr ? *parts.first : none,
           parts.second != nullptr ? *parts.second : none);
    }
  }

  const SnapshotShare& then_;
  const SnapshotShare& now_;
  std::vector<Change>& out_;
  GreatFolders* folders_ = nullptr;
};

}  // namespace

GrowthBases growth_bases(std::span<const int64_t> times, int64_t now) {
  GrowthBases bases;
  for (const int64_t time : times) {
    if (time <= now && time > bases.last.value_or(INT64_MIN)) {
      bases.last = time;
    }
  }
  bases.week = nearest(times, now, 7, 5, 14);
  bases.month = nearest(times, now, 30, 20, 60);
  return bases;
}

const char* word_of(GrowthKind kind) {
  constexpr std::array kWords{"share", "owner", "type", "folder", "folder_at_least"};
  return kWords[static_cast<size_t>(kind)];
}

std::vector<Change> changes_between(const Snapshot& then, const Snapshot& now) {
  std::vector<Change> changes;
  GreatFolders folders;
  const auto then_smallest = then.smallest_folder();
  const auto now_smallest = now.smallest_folder();
  for (const SnapshotShare& share : now.shares) {
    const SnapshotShare* before = then.find(share.name);
    if (before == nullptr || !before->is_whole || !share.is_whole) {
      continue;
    }
    ShareGrowth growth(*before, share, changes);
    growth.add_totals();
    if (now.owners_among && now.owners_among == then.owners_among) {
      growth.add_named(GrowthKind::kOwner, &SnapshotPart::owners);
    }
    if (now.has_types && then.has_types) {
      growth.add_named(GrowthKind::kType, &SnapshotPart::types);
    }
    growth.add_folders(folders, then_smallest, now_smallest);
  }
  std::ranges::move(folders.take(), std::back_inserter(changes));
  return changes;
}

const GrowthSince* find_since(const Growth& growth, std::string_view since) {
  const auto found = std::find_if(growth.begin(), growth.end(),
                                  [&](const GrowthSince& one) { return one.since == since; });
  return found == growth.end() ? nullptr : &*found;
}

const GrowthSince* longest_of(const Growth& growth) {
  return growth.empty() ? nullptr : &growth.back();
}

int64_t bounded_sum(int64_t one, int64_t two) {
  int64_t sum = 0;
  if (__builtin_add_overflow(one, two, &sum)) {
    return one < 0 ? -INT64_MAX : INT64_MAX;
  }
  return std::max(sum, -INT64_MAX);
}

std::vector<Change> greatest_changes(const GrowthSince& since) {
  std::map<std::tuple<GrowthKind, std::string_view, std::string_view>, Change> sums;
  for (const Change& change : since.changes) {
    const auto [place, is_new] = sums.try_emplace(
        {change.kind, change.share, change.name},
        Change{change.kind, change.share, "", change.name, change.files, change.bytes});
    if (!is_new) {
      place->second.files = bounded_sum(place->second.files, change.files);
      place->second.bytes = bounded_sum(place->second.bytes, change.bytes);
    }
  }
  std::vector<Change> rows;
  for (auto& [key, sum] : sums) {
    if (sum.files != 0 || sum.bytes != 0) {
      rows.push_back(std::move(sum));
    }
  }
  std::sort(rows.begin(), rows.end(),
            [](const Change& one, const Change& two) { return order_of(one) < order_of(two); });
  std::map<GrowthKind, size_t> counts;
  std::erase_if(rows,
                [&](const Change& row) { return ++counts[group_of(row.kind)] > kMostGrowthRows; });
  return rows;
}

}  // namespace vornreport
