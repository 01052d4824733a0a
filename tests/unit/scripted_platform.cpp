#include "scripted_platform.hpp"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <mutex>

#include "base/text_containers.hpp"
#include "vorn/config.h"
#include "vorn/fleet.h"
#include "vorn/report.h"
#include "vorn/share.h"
#include "vorn/user.h"
#include "vorn/volume.h"

ScriptedPlatform platform;

namespace {

std::string shown(const char* text) {
  return text != nullptr ? text : "(null)";
}

template <typename... Words>
void record(Words... words) {
  std::string call;
  ((call += (call.empty() ? "" : " ") + shown(words)), ...);
  static std::mutex mutex;  // digests are computed by several threads
  const std::lock_guard lock(mutex);
  platform.calls.push_back(call);
}

void fill(VLIBCSzHash** hash, const TextMap& entries) {
  for (const auto& [key, value] : entries) {
    VLIBCSzHashSetValue(hash, key.c_str(), value.c_str());
  }
}

int made(const char* name, VLIBCSzHash** hash, const TextMap& entries) {
  if (platform.fails(name)) {
    return -1;
  }
  if (*hash == nullptr) {
    *hash = VLIBCSzHashAlloc(8);
  }
  fill(hash, entries);
  return 0;
}

int copied(const std::string& text, char* out, size_t size) {
  if (text.size() >= size) {
    *out = '\0';
    return -1;
  }
  std::memcpy(out, text.c_str(), text.size() + 1);
  return static_cast<int>(text.size());
}

int answer(const char* name, int result = 0) {
  return platform.fails(name) ? -1 : result;
}

TextMap share_paths() {
  return {platform.shares.begin(), platform.shares.end()};
}

}  // namespace

extern "C" {

void VornQazSetEnv(void) {}

int VLIBCFileGetSection(const char* file, const char* section, VLIBCSzHash** hash) {
  record("GetSection", file, section);
  const auto found = platform.config.find(section);
  if (found == platform.config.end()) {
    return -1;
  }
  fill(hash, found->second);
  return static_cast<int>(found->second.size());
}

int VLIBCFileSetSection(const char* file, const char* section, const char* new_name,
                        const VLIBCSzHash* hash, const char* line_format) {
  record("SetSection", file, section, new_name, VLIBCSzHashGetValue(hash, "report_list"),
         line_format);
  return answer("SetSection");
}

int VornQazEnumProfile(VLIBCSzList** list, int /*flags*/) {
  for (const auto& section : platform.config) {
    VLIBCSzListPush(list, section.first.c_str());
  }
  return static_cast<int>(platform.config.size());
}

int VornQazProfileRunning(const char* profile) {
  record("ProfileRunning", profile);
  return platform.running.count(profile) != 0 ? 1 : 0;
}

int VornQazStatusUpdate(const char* profile, const char* status) {
  record("StatusUpdate", profile, status);
  return answer("StatusUpdate");
}

int VornQazInitLocation(VLIBCSzHash** hash, int /*flags*/) {
  return made("InitLocation", hash, platform.locations);
}

int VornQazInitRealPath(const char* profile, VLIBCSzHash** hash, int for_report) {
  record("InitRealPath", profile, for_report != 0 ? "1" : "0");
  return made("InitRealPath", hash, platform.real_paths);
}

int VornQazReportCleanTmp(const char* profile, const VLIBCSzHash* hash) {
  record("ReportCleanTmp", profile, hash != nullptr ? "loaded" : nullptr);
  return 0;
}

int VornQazScheduleClean(const char* profile, VLIBCSzHash** hash, const char* key) {
  record("ScheduleClean", profile, key);
  (*hash)->remove(key);
  return answer("ScheduleClean", platform.schedule_clean);
}

int VornQazImportLang(const VLIBCSzHash* /*hash*/, char* code, size_t size) {
  return platform.fails("ImportLang") ? -1 : copied(platform.language, code, size);
}

int VornQazMatchShare(const VLIBCSzHash* /*hash*/, const char* share) {
  return platform.unselected.count(share) == 0 ? 1 : 0;
}

int VornQazInitFilterUser(VLIBCSzHash** hash) {
  return made("InitFilterUser", hash, {});
}

int VornQazGetSharePathHash(VLIBCSzHash** hash) {
  return made("GetSharePathHash", hash, share_paths());
}

int VornQazGetVolumePathHash(VLIBCSzHash** hash) {
  return made("GetVolumePathHash", hash, platform.volumes);
}

int VornQazInitFileTypeHash(VLIBCSzHash** hash) {
  return made("InitFileTypeHash", hash, platform.file_types);
}

int VornQazVolumeGetId(const char* mount_path, char* id, size_t size) {
  const auto found = platform.volume_ids.find(mount_path);
  return found == platform.volume_ids.end() ? -1 : copied(found->second, id, size);
}

int VORNShareEnum(VLIBCSzList** list, int /*flags*/) {
  for (const auto& share : platform.shares) {
    VLIBCSzListPush(list, share.first.c_str());
  }
  return answer("ShareEnum", static_cast<int>(platform.shares.size()));
}

int VORNSharePathGet(const char* share, char* path, size_t size) {
  const TextMap paths = share_paths();
  const auto found = paths.find(share);
  return found == paths.end() || found->second.empty() ? -1 : copied(found->second, path, size);
}

int VORNShareFileIndexIsEnabled(const char* share) {
  return platform.indexes.count(share) != 0 ? 1 : 0;
}

int VORNShareFileIndexDBPathGet(const char* share, char* path, size_t size) {
  return platform.fails("FileIndexDBPathGet") ? -1 : copied(platform.indexes[share], path, size);
}

int VORNGetFSType(const char* path, int /*flags*/) {
  const auto found = platform.fs_kinds.find(path);
  return found == platform.fs_kinds.end() ? platform.fs_kind : found->second;
}

int VORNUserGetUGID(const char* name, uid_t* uid, gid_t* /*gid*/) {
  const auto found = platform.users.find(name);
  if (found == platform.users.end()) {
    return -1;
  }
  *uid = found->second;
  return 0;
}

namespace {

int made_user(const std::string& name, unsigned uid, VORNUser** user) {
  auto* record = new VORNUser{new char[name.size() + 1], uid, 0};
  std::memcpy(record->name, name.c_str(), name.size() + 1);
  *user = record;
  return 0;
}

}  // namespace

int VORNUserGet(const char* name, VORNUser** user) {
  const auto found = platform.users.find(name);
  *user = nullptr;
  return found == platform.users.end() ? -1 : made_user(name, found->second, user);
}

int VORNUserGetByUID(uid_t uid, VORNUser** user) {
  *user = nullptr;
  for (const auto& [name, id] : platform.users) {
    if (id == uid) {
      return made_user(name, id, user);
    }
  }
  return -1;
}

void VORNUserFree(VORNUser* user) {
  if (user != nullptr) {
    delete[] user->name;
    delete user;
  }
}

VORNMountVolInfo* VORNMountVolAllEnum(const char* /*filter*/, int /*selector*/) {
  VORNMountVolInfo* first = nullptr;
  for (auto volume = platform.mounted.rbegin(); volume != platform.mounted.rend(); ++volume) {
    first = new VORNMountVolInfo{volume->path.data(), volume->free_size, volume->total_size, first};
  }
  return first;
}

void VORNMountVolInfoFree(VORNMountVolInfo* volumes) {
  while (volumes != nullptr) {
    VORNMountVolInfo* next = volumes->next;
    delete volumes;
    volumes = next;
  }
}

int VORNVolumeOfPath(const char* path, char* mount_path, size_t size) {
  const std::string text = path;
  for (const auto& [folder, volume] : platform.volumes_of) {
    if (text == folder || text.starts_with(folder + "/")) {
      return copied(volume, mount_path, size);
    }
  }
  return copied("/", mount_path, size);
}

int VORNMountSharedEnum(VLIBCSzList** list) {
  for (const std::string& path : platform.shared_mounts) {
    VLIBCSzListPush(list, path.c_str());
  }
  return static_cast<int>(platform.shared_mounts.size());
}

int VORNVolumeHasQuotas(const char* mount_path) {
  return platform.quotas.count(mount_path) != 0 ? 1 : 0;
}

int VornQazGetHostName(char* out, size_t size) {
  return copied("files", out, size);
}

int VornQazGetTimeZone(char* out, size_t size) {
  return copied("Europe/Berlin", out, size);
}

// No fleet is configured.
int VORNFleetOpen(VORNFleet** fleet) {
  *fleet = nullptr;
  return 1;
}
void VORNFleetClose(VORNFleet* /*fleet*/) {}
const char* VORNFleetServer(const VORNFleet* /*fleet*/) {
  return "";
}
const char* VORNFleetProblem(const VORNFleet* /*fleet*/) {
  return "";
}
int VORNFleetInsert(VORNFleet* /*fleet*/, const char* /*table*/, VORNFleetFormat /*format*/,
                    VORNFleetSource /*source*/, void* const* /*contexts*/, size_t /*count*/) {
  return -1;
}
int VORNFleetSelect(VORNFleet* /*fleet*/, const char* /*sql*/, VORNFleetRow /*row*/,
                    void* /*context*/) {
  return -1;
}
int VORNFleetRuns(VORNFleet* /*fleet*/, VORNFleetRow /*row*/, void* /*context*/) {
  return -1;
}
int VORNFleetReportBegin(const char* /*folder*/, VLIBCSzHash** /*hash*/) {
  return -1;
}
int VORNFleetReportEnd(int /*is_made*/) {
  return -1;
}

int VornQazProgressUpdate(const char* /*profile*/, const char* text) {
  platform.progress.emplace_back(text);
  return 0;
}

void VornQazStatusMailFailed(void) {}

void VornQazStatusFleetFailed(void) {}

void VornQazDataFailed(const char* /*profile*/) {}

void VornQazProgressEnd(const char* profile) {
  platform.progress.push_back(std::string("end ") + profile);
}

int VornQazGetFileMd5(const char* path, unsigned long long /*size*/, char* digest,
                      size_t digest_size) {
  const std::string file = std::filesystem::read_symlink(path);  // the caller's handle
  record("GetFileMd5", file.c_str());
  const auto found = platform.digests.find(file);
  const std::string text = found != platform.digests.end() ? found->second : "";
  if (text.size() <= 2) {
    errno = text == "w" ? EWOULDBLOCK : errno;
    return text == "2" || text == "w" ? 2 : -1;
  }
  std::string padded = text;
  padded.resize(digest_size, '0');
  std::memcpy(digest, padded.data(), digest_size);
  return 0;
}

void VornQazSetDigestStep(void (*step)(unsigned long long bytes)) {
  platform.step = step;
}

void VornQazSetDigestDeadline(unsigned long long seconds) {
  record("SetDigestDeadline", std::to_string(seconds).c_str());
}

int VornQazDigestDeadlinePassed(void) {
  return platform.is_past_deadline && platform.is_past_deadline() ? 1 : 0;
}

int VornGetTargetLink(const VLIBCSzHash* /*hash*/, const char* target_file, char* link,
                      size_t size) {
  record("GetTargetLink", target_file);
  return platform.fails("GetTargetLink") ? -1 : copied(platform.link, link, size);
}

int VornQazSendReport(const char* profile, const char* link, const VLIBCSzHash* /*hash*/) {
  record("SendReport", profile, link);
  return answer("SendReport");
}
}
