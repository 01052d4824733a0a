#include "facts/tallies.hpp"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>

#include "facts/progress.hpp"
#include "facts/run_facts.hpp"
#include "vorn/volume.h"
#include "vornreport/fixed_text.hpp"

namespace vornreport {
namespace {

constexpr unsigned kVolumeShift = 32;  // above the bits of a user id

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
    : name_(std::move(name)), path_(std::move(path)), volumes_{std::move(volume)} {}

void ShareTally::file(const FileInfo& info, RowSource source) {
  constexpr uint64_t kBlock = 512;
  const auto size = static_cast<uint64_t>(info.pst->st_size);
  const bool walked = source == RowSource::kWalk;
  const size_t volume = walked ? volume_of(info.pst->st_dev, info.szPath) : 0;
  total_.add(size);
  allocated_ += walked ? static_cast<uint64_t>(info.pst->st_blocks) * kBlock /
                             std::max<uint64_t>(info.pst->st_nlink, 1)
                       : size;
  by_owner_[uint64_t{volume} << kVolumeShift | info.pst->st_uid].add(size);
  by_label_[info.szType].add(size);
}

void ShareTally::begin_again() {
  *this = ShareTally(std::move(name_), std::move(path_), std::move(volumes_.front()));
}

void ShareTally::finish() {
  for (const auto& [label, amount] : by_label_) {
    types_[label].add(amount);
  }
  by_label_.clear();
}

std::map<ShareTally::OwnerOnVolume, Amount> ShareTally::owners() const {
  std::map<OwnerOnVolume, Amount> owners;
  for (const auto& [key, amount] : by_owner_) {
    owners[{static_cast<uid_t>(key), volumes_[key >> kVolumeShift]}].add(amount);
  }
  return owners;
}

// Devices are few, and a subvolume has one of its own; the newest comes first.
size_t ShareTally::volume_of(dev_t device, const char* path) {
  for (const auto& [known, volume] : devices_) {
    if (known == device) {
      return volume;
    }
  }
  const std::string found = volume_at(path);
  const auto place = std::find(volumes_.begin(), volumes_.end(), found);
  const auto index = static_cast<size_t>(place - volumes_.begin());
  if (place == volumes_.end()) {
    volumes_.push_back(found);
  }
  devices_.emplace_back(device, index);
  return index;
}

void Tallies::begin_share(const char* name, const char* path) {
  shares_.emplace_back(name, path, volume_at(path));
  is_counting_ = true;
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

void Tallies::count_file(const FileInfo& info, RowSource source) {
  shares_.back().file(info, source);
  const auto mtime = static_cast<uint32_t>(info.pst->st_mtime);
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
