#include "machine/volume_space.hpp"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <functional>
#include <memory>
#include <utility>

#include "base/host_log.hpp"
#include "base/incident.hpp"
#include "machine/mounts.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/volume.h"

namespace host {

Space space_of(const struct statvfs& measured) {
  const std::uint64_t block = measured.f_frsize != 0 ? measured.f_frsize : measured.f_bsize;
  const std::uint64_t used = measured.f_blocks - std::min(measured.f_bfree, measured.f_blocks);
  // Some file systems count below zero when users have taken what is reserved for root.
  const bool negative = (measured.f_bavail >> 63U) != 0;
  const std::uint64_t available = negative ? 0 : measured.f_bavail;
  return {(used + available) * block, available * block};
}

Measurements::Measured Measurements::measure(const Volume& volume, Clock::time_point now) {
  const ErrnoKeeper keeper;
  struct statvfs measured {};
  int result = -1;
  errno = ETIMEDOUT;
  if (!hangs(volume.kind, volume.path)) {
    do {
      result = statvfs(volume.path.c_str(), &measured);
    } while (result != 0 && errno == EINTR);
  }
  if (result == 0) {
    return {now, space_of(measured), ""};
  }
  const std::string problem = "volume \"" + volume.path +
                              "\" is left out, since it can't be measured (" +
                              std::strerror(errno) + "); see to its mount";
  log_line("%s", problem.c_str());
  return {now, std::nullopt, problem};
}

std::optional<Space> Measurements::of(const Volume& volume, Clock::time_point now) {
  constexpr std::chrono::minutes kMostAge{5};
  auto entry = known_.find(volume.device);
  if (entry == known_.end() || now - entry->second.time >= kMostAge) {
    entry = known_.insert_or_assign(volume.device, measure(volume, now)).first;
  }
  if (!entry->second.space) {
    tell_incident("volume_unknown", volume.path, entry->second.problem);
  }
  return entry->second.space;
}

namespace {

// What a caller holds as a VORNMountVolInfo, with the text of its path.
struct Record : VORNMountVolInfo {
  Record(std::string mount_path, Space space) : text(std::move(mount_path)) {
    path = text.data();
    free_size = space.free;
    total_size = space.total;
    next = nullptr;
  }
  std::string text;
};

struct FreeRecords {
  void operator()(VORNMountVolInfo* volumes) const { VORNMountVolInfoFree(volumes); }
};
using Records = std::unique_ptr<VORNMountVolInfo, FreeRecords>;

// Those that hold data. Of them those that have quotas; where none seems to, the tool shall say why
// a report of quotas that somebody wants comes to nothing.
std::vector<Volume> selected_volumes(int selector) {
  std::vector<Volume> volumes = read_volumes().volumes;
  std::erase_if(volumes, [](const Volume& volume) { return !volume.holds_data; });
  const auto has_quotas = [](const Volume& volume) { return volume.has_user_quotas; };
  if (selector == VORN_VOLUMES_OF_QUOTA &&
      std::any_of(volumes.begin(), volumes.end(), has_quotas)) {
    std::erase_if(volumes, std::not_fn(has_quotas));
  }
  return volumes;
}

Records measure_volumes(int selector) {
  static Measurements measurements;
  Records first;
  VORNMountVolInfo* last = nullptr;
  for (const Volume& volume : selected_volumes(selector)) {
    const auto space = measurements.of(volume);
    if (!space) {
      continue;
    }
    Records added(new Record(volume.path, *space));
    VORNMountVolInfo* record = added.get();
    if (last == nullptr) {
      first = std::move(added);
    } else {
      last->next = added.release();
    }
    last = record;
  }
  return first;
}

}  // namespace
}  // namespace host

VORNMountVolInfo* VORNMountVolAllEnum(const char* filter, int selector) try {
  if (filter != nullptr) {
    errno = EINVAL;
    return nullptr;
  }
  const host::ErrnoKeeper keeper;
  return host::measure_volumes(selector).release();
} catch (...) {
  errno = ENOMEM;
  return nullptr;
}

void VORNMountVolInfoFree(VORNMountVolInfo* volumes) {
  while (volumes != nullptr) {
    VORNMountVolInfo* next = volumes->next;
    delete static_cast<host::Record*>(volumes);
    volumes = next;
  }
}
