#include "facts/tallies.hpp"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <numeric>

#include "facts/progress.hpp"
#include "facts/run_facts.hpp"
#include "vorn/volume.h"
#include "vornreport/fixed_text.hpp"

namespace vornreport {
namespace {

std::string volume_at(const char* path) {
  PathText volume;
  if (*path == '\0' || VORNVolumeOfPath(path, volume.data(), PathText::size()) >= 0) {
    return volume.c_str();
  }
  const int error = errno;
  if (error != ENOENT) {  // a share without its folder has an incident of its own
    record_incident("volume_unknown", path,
                    std::string("the volume that holds ") + path + " can't be told (" +
                        std::strerror(error) + "); see to its mount");
  }
  return "";
}

}  // namespace

ShareTally::ShareTally(std::string name, std::string path, std::string volume)
    : name_(std::move(name)), path_(std::move(path)), volumes_(1) {
  volumes_.front().volume = std::move(volume);
}

void ShareTally::enter(dev_t device, const char* path, CountedElsewhere elsewhere) {
  const bool is_same = !inside_.empty() && inside_.back().device == device;
  inside_.push_back({device, is_same ? inside_.back().volume : volume_of(device, path),
                     std::max(elsewhere, this->elsewhere())});
}

void ShareTally::leave() {
  inside_.pop_back();
}

bool ShareTally::is_counted_elsewhere(const char* path) const {
  if (!inside_.empty()) {
    return elsewhere() == CountedElsewhere::kYes;
  }
  const std::string_view below =
      std::string_view(path).substr(std::min(path_.size() + 1, std::strlen(path)));
  return std::any_of(of_others_.begin(), of_others_.end(), [&](const std::string& folder) {
    return folder.empty() ||
           (below.starts_with(folder) && below.substr(folder.size()).starts_with('/'));
  });
}

void ShareTally::file(const FileInfo& info, RowSource source, int64_t now) {
  constexpr uint64_t kBlock = 512;
  const auto size = static_cast<uint64_t>(info.pst->st_size);
  const bool is_walked = source == RowSource::kWalk;
  const bool is_here = !inside_.empty() && inside_.back().device == info.pst->st_dev;
  VolumeTally& volume = volumes_[is_here     ? here()
                                 : is_walked ? volume_of(info.pst->st_dev, info.szPath)
                                             : 0];
  const uint64_t allocated = is_walked ? static_cast<uint64_t>(info.pst->st_blocks) * kBlock /
                                             std::max<uint64_t>(info.pst->st_nlink, 1)
                                       : size;
  volume.total.add(size);
  add_bounded(volume.allocated, allocated);
  add_bounded(volume.explained, is_counted_elsewhere(info.szPath) ? 0 : allocated);
  volume.owners[info.pst->st_uid].add(size);
  volume.labels[info.szType].add(size);
  // As stored: what wraps there, wraps here.
  ages_[report_format::age_of(static_cast<uint32_t>(info.pst->st_mtime), now)].add(size);
  is_of_index_ = is_of_index_ || !is_walked;
}

void ShareTally::begin_again() {
  *this = ShareTally(std::move(name_), std::move(path_), std::move(volumes_.front().volume));
}

void ShareTally::finish() {
  for (VolumeTally& volume : volumes_) {
    for (const auto& [label, amount] : volume.labels) {
      volume.types[label].add(amount);
    }
    volume.labels.clear();
  }
}

Amount ShareTally::total() const {
  Amount sum;
  for (const VolumeTally& volume : volumes_) {
    sum.add(volume.total);
  }
  return sum;
}

uint64_t ShareTally::allocated() const {
  uint64_t sum = 0;
  for (const VolumeTally& volume : volumes_) {
    add_bounded(sum, volume.allocated);
  }
  return sum;
}

uint64_t ShareTally::unreadables() const {
  return std::accumulate(
      volumes_.begin(), volumes_.end(), uint64_t{0},
      [](uint64_t sum, const VolumeTally& volume) { return sum + volume.unreadable; });
}

uint64_t ShareTally::others() const {
  return std::accumulate(
      volumes_.begin(), volumes_.end(), uint64_t{0},
      [](uint64_t sum, const VolumeTally& volume) { return sum + volume.other; });
}

// Devices are few, and a subvolume has one of its own; the newest comes first.
size_t ShareTally::volume_of(dev_t device, const char* path) {
  for (const auto& [known, volume] : devices_) {
    if (known == device) {
      return volume;
    }
  }
  const std::string found = volume_at(path);
  const auto place = std::find_if(volumes_.begin(), volumes_.end(),
                                  [&](const VolumeTally& tally) { return tally.volume == found; });
  const auto index = static_cast<size_t>(place - volumes_.begin());
  if (place == volumes_.end()) {
    volumes_.emplace_back().volume = found;
  }
  devices_.emplace_back(device, index);
  return index;
}

void Tallies::begin_share(const char* name, const char* path, int64_t now) {
  shares_.emplace_back(name, path, volume_at(path));
  folders_.begin_share(shares_.size() - 1);
  now_ = now;
  is_counting_ = true;
}

void Tallies::begin_share_again() {
  shares_.back().begin_again();
  folders_.forget_share(shares_.size() - 1);
}

void Tallies::end_share() {
  if (is_counting_) {
    shares_.back().finish();
  }
  is_counting_ = false;
}

void Tallies::clear() {
  *this = Tallies();
}

void Tallies::enter(std::string_view name, dev_t device, const char* path,
                    CountedElsewhere elsewhere) {
  if (is_counting_) {
    shares_.back().enter(device, path, elsewhere);
    folders_.enter(name, shares_.back().here());
  }
}

void Tallies::leave() {
  if (is_counting_) {
    shares_.back().leave();
    folders_.leave();
  }
}

void Tallies::count_file(const FileInfo& info, RowSource source) {
  const auto mtime = static_cast<uint32_t>(info.pst->st_mtime);
  shares_.back().file(info, source, now_);
  if (source == RowSource::kWalk) {
    folders_.file(static_cast<uint64_t>(info.pst->st_size), mtime);
  }
  if (mtime < oldest_.mtime && mtime != 0) {
    oldest_ = {mtime, info.szPath};
  }
  progress_file(++files_);
}

Tallies& tallies() {
  static Tallies instance;
  return instance;
}

}  // namespace vornreport
