// Which mounts are volumes, and what they are called.
#include "machine/volumes.hpp"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <set>

#include "base/text_containers.hpp"
#include "machine/file_system.hpp"
#include "machine/volume_space.hpp"
#include "support.hpp"
#include "vorn/report.h"
#include "vorn/volume.h"

namespace {

std::vector<host::Mount> mounts_of(const std::string& table) {
  const support::TempFolder folder;
  support::write_file(folder.path("mountinfo"), table);
  return host::read_mounts(folder.path("mountinfo").c_str());
}

std::vector<std::string> paths_of(const std::vector<host::Volume>& volumes) {
  std::vector<std::string> paths;
  for (const host::Volume& volume : volumes) {
    paths.push_back(volume.path + (volume.holds_data ? "" : " (no data)"));
  }
  return paths;
}

}  // namespace

TEST(FileSystemKind, FollowsStatfsAndTheMountTable) {
  const std::pair<unsigned long, int> magics[] = {
      {0xEF53, VORN_FS_EXT},        {0x58465342, VORN_FS_XFS},     {0x9123683E, VORN_FS_COW},
      {0x2FC12FC1, VORN_FS_COW},    {0x01021994, VORN_FS_MEMORY},  {0x6969, VORN_FS_REMOTE},
      {0xFF534D42, VORN_FS_REMOTE}, {0x00C36400, VORN_FS_CLUSTER}, {0x9FA0, VORN_FS_OTHER}};
  for (const auto& [magic, kind] : magics) {
    EXPECT_EQ(kind, host::kind_of_magic(magic)) << std::hex << magic;
  }
  const std::pair<std::vector<const char*>, int> names[] = {
      {{"fuse.glusterfs", "fuse.ceph-fuse", "ceph"}, VORN_FS_CLUSTER},
      {{"nfs", "nfs4", "cifs", "smb3"}, VORN_FS_REMOTE},
      {{"fuse.sshfs"}, VORN_FS_OTHER}};
  for (const auto& [group, kind] : names) {
    for (const char* name : group) {
      EXPECT_EQ(kind, host::kind_of_name(name)) << name;
    }
  }
}

TEST(Volumes, AreTheDevicesOfTheMountTable) {
  const auto mounts = mounts_of(
      "20 1 8:1 / / rw shared:1 - ext4 /dev/sda1 rw\n"
      "21 20 0:5 / /proc rw - proc proc rw\n"
      "22 20 0:6 / /run rw - tmpfs tmpfs rw\n"
      "23 20 8:2 /sub /srv/bind rw - xfs /dev/sda2 rw\n"
      "24 20 8:2 / /srv/whole\\040disk rw - xfs /dev/sda2 rw\n"
      "25 20 8:1 /home /mnt/h rw - ext4 /dev/sda1 rw\n"
      "26 20 0:40 /@data /data/long rw - btrfs /dev/sdb rw\n"
      "27 20 0:40 /@home /home rw - btrfs /dev/sdb rw\n"
      "28 20 7:1 / /snap/core/1 ro - squashfs /dev/loop1 ro\n"
      "29 20 0:50 / /net rw - nfs4 server:/x rw\n"
      "30 20 8:3 / /over rw - ext4 /dev/sdc rw\n"
      "31 20 8:4 / /over rw - ext4 /dev/sdd rw\n"
      "32 20 0:60 / /gluster rw - fuse.glusterfs g:/v rw\n");
  EXPECT_EQ((std::vector<std::string>{"/", "/run (no data)", "/srv/whole disk", "/home", "/over",
                                      "/gluster"}),
            paths_of(host::choose_volumes(mounts)));
  std::string shared;
  for (const host::Mount* mount : host::shared_mounts(mounts)) {
    shared += mount->target + " ";
  }
  EXPECT_EQ("/ /srv/bind /srv/whole disk /mnt/h /data/long /home ", shared);
}

TEST(Volumes, OfAContainerAreWhereTheSharesAre) {
  auto mounts = mounts_of(
      "1 0 0:90 / / rw - overlay overlay rw\n"
      "2 1 8:1 /etc /etc rw - ext4 /dev/sda1 rw\n"
      "3 1 8:1 /export /srv/share rw - ext4 /dev/sda1 rw\n");
  ASSERT_EQ(3U, mounts.size());
  EXPECT_EQ((std::vector<std::string>{"/", "/etc"}), paths_of(host::choose_volumes(mounts)));
  mounts[2].holds_share = true;
  EXPECT_EQ((std::vector<std::string>{"/", "/srv/share"}), paths_of(host::choose_volumes(mounts)));
}

TEST(Volumes, OfTheNetworkAreThoseOfSharesThatSaySo) {
  const support::TempFolder folder;
  const host::ServerVolumes server = {
      mounts_of("9998 1 0:90 / / rw - overlay overlay rw\n9999 9998 0:50 / " + folder.path() +
                " rw - nfs4 server:/x rw\n"),
      {}};
  const std::vector<host::Share> shares = {{"local", folder.path(), {}, {}, false},
                                           {"remote", folder.path(), {}, {}, true}};
  const support::Hash hash = support::make_hash();
  host::add_volume_paths(server, shares, *hash);
  EXPECT_EQ(nullptr, VLIBCSzHashGetValue(hash.get(), "local"));
  EXPECT_STREQ(folder.path().c_str(), VLIBCSzHashGetValue(hash.get(), "remote"));
  const std::string log = support::syslog_text();
  EXPECT_TRUE(log.starts_with("share \"local\" is left out")) << log;
  EXPECT_NE(std::string::npos, log.find("run vornctl share set '")) << log;
}

TEST(Volumes, KeepQuotasByTheirMountOptions) {
  const std::pair<const char*, bool> cases[] = {
      {"rw", false},
      {"rw,usrquota,grpquota", true},
      {"rw,usrjquota=aquota.user,jqfmt=vfsv1", true},
      {"rw,usrjquota=,jqfmt=vfsv1", false},
      {"rw,quota", true},
      {"rw,uquota", true},
      {"rw,uqnoenforce,inode64", true},
      {"rw,noquota", false},
      {"rw,grpquota,prjquota,gqnoenforce,pqnoenforce,grpjquota=x", false},
      {"rw,nousrquota,x=usrquota", false}};
  for (const auto& [options, expected] : cases) {
    const auto mounts = mounts_of(std::string("20 1 8:1 / / rw - xfs /dev/sda1 ") + options + "\n");
    ASSERT_EQ(1U, mounts.size());
    EXPECT_EQ(expected, mounts[0].has_user_quotas) << options;
  }
  EXPECT_EQ(0, VORNVolumeHasQuotas("/nowhere"));
}

TEST(Volumes, AreFoundByPath) {
  const support::TempFolder folder;
  std::filesystem::create_symlink("/tmp/vol-storage-1", folder.path("link"));
  char path[32] = "";
  EXPECT_EQ(18, VORNVolumeOfPath(folder.path("link").c_str(), path, sizeof path));
  EXPECT_STREQ("/tmp/vol-storage-1", path);
  EXPECT_EQ(5, VORNVolumeOfPath("/proc/self", path, 6));
  EXPECT_STREQ("/proc", path) << "no volume, but a mount";
  for (const auto& [bad, size] : {std::pair("/proc/self", 5), {"/nowhere", 32}, {"", 32}}) {
    EXPECT_EQ(-1, VORNVolumeOfPath(bad, path, static_cast<std::size_t>(size))) << bad;
    EXPECT_STREQ("", path);
  }
  // A folder of a device that is mounted more than once has the volume of the enumeration.
  char* const source = realpath(VORN_TEST_SOURCE_DIR, nullptr);
  char long_path[4096] = "";
  ASSERT_LT(0, VORNVolumeOfPath(source, long_path, sizeof long_path));
  free(source);
  VORNMountVolInfo* volumes = VORNMountVolAllEnum(nullptr, VORN_VOLUMES_OF_USAGE);
  bool is_there = false;
  for (const auto* volume = volumes; volume != nullptr; volume = volume->next) {
    is_there = is_there || std::strcmp(volume->path, long_path) == 0;
  }
  VORNMountVolInfoFree(volumes);
  EXPECT_TRUE(is_there) << long_path;
}

// --- Measuring ----------------------------------------------------------------------------------

namespace {

std::vector<std::string> told;  // to the sink

class Measuring : public testing::Test {
 protected:
  Measuring() {
    told.clear();
    VornQazSetIncidentSink([](const char* kind, const char* what, const char* text) {
      told.push_back(std::string(kind) + "|" + what + "|" + text);
    });
  }
  ~Measuring() override { VornQazSetIncidentSink(nullptr); }

  // Bytes free of `volume` that long after the start; -1 when it can't be measured.
  long long free_after(const host::Volume& volume, std::chrono::seconds time) {
    const auto space = measurements_.of(volume, start_ + time);
    return space ? static_cast<long long>(space->free) : -1;
  }

 private:
  host::Measurements measurements_;
  const host::Measurements::Clock::time_point start_ = host::Measurements::Clock::now();
};

}  // namespace

TEST_F(Measuring, CountsForFiveMinutes) {
  const host::Volume volume = {7, "/tmp/vol-storage-1", VORN_FS_MEMORY, true};
  const host::Volume other = {8, "/tmp/vol-storage-2", VORN_FS_MEMORY, true};
  using namespace std::chrono_literals;
  const long long before = free_after(volume, 0s);
  EXPECT_EQ(4'194'304, before);
  support::write_file(volume.path + "/file", std::string(65536, 'x'));
  EXPECT_EQ(before, free_after(volume, 299s));
  EXPECT_EQ(before, free_after(other, 299s));
  EXPECT_EQ(before - 65536, free_after(volume, 300s));
  std::filesystem::remove(volume.path + "/file");
  EXPECT_EQ(before - 65536, free_after(volume, 599s));
  EXPECT_EQ(before, free_after(volume, 600s));
  EXPECT_TRUE(told.empty());
}

TEST_F(Measuring, TellsWhatCannotBeMeasured) {
  using namespace std::chrono_literals;
  const support::TempFolder folder;
  const host::Volume gone = {7, folder.path("gone"), VORN_FS_EXT, true};
  const std::string problem = "volume \"" + gone.path +
                              "\" is left out, since it can't be measured (No such file or "
                              "directory); see to its mount";
  for (const auto time : {0s, 299s, 300s}) {
    EXPECT_EQ(-1, free_after(gone, time));
  }
  // Whoever asks is told each time: a sample is stored before the report that must say so begins.
  EXPECT_EQ(std::vector(3, "volume_unknown|" + gone.path + "|" + problem), told);
  EXPECT_EQ(problem + "\n" + problem, support::syslog_text());
  std::filesystem::create_directory(gone.path);
  EXPECT_EQ(-1, free_after(gone, 599s));
  EXPECT_LT(0, free_after(gone, 600s));
}

TEST(VolumeId, IsSafeShortAndUnique) {
  EXPECT_EQ("/srv/data-1_2.x", host::volume_id("/srv/data-1_2.x"));
  EXPECT_EQ("/srv/a_b-47bf2a0c", host::volume_id("/srv/a b")) << "stored from run to run";
  const std::string plain48 = "/" + std::string(47, 'v');
  const std::string hostile[] = {"/srv/a b", "/srv/a'b",    "/srv/a\\b",  "/srv/a\nb",
                                 plain48,    plain48 + "1", plain48 + "2"};
  std::set<std::string> ids;
  for (const std::string& path : hostile) {
    const std::string id = host::volume_id(path);
    EXPECT_LE(id.size(), 48U);
    EXPECT_EQ(std::string::npos, id.find_first_of(" '\\\n")) << id;
    ids.insert(id);
  }
  EXPECT_EQ(std::size(hostile), ids.size());
}

TEST(VolumeId, OfACutPathIsThatOfTheVolume) {
  const std::vector<host::Volume> volumes = {
      {1, "/srv/storage/projects", VORN_FS_EXT, true},
      {2, "/srv/storage/private", VORN_FS_EXT, true},
      {3, "/srv/storage/backup", VORN_FS_EXT, true},
      {4, "/srv/storage/backup/layer", VORN_FS_MEMORY, false}};
  const std::pair<const char*, const char*> cases[] = {
      {"/srv/storage/pr", "/srv/storage/pr..."},   // nobody can tell which of the two
      {"/srv/storage/ba", "/srv/storage/backup"},  // the layer is no volume of the reports
      {"/srv/storage/xx", "/srv/storage/xx"}};
  for (const auto& [path, expected] : cases) {
    EXPECT_EQ(expected, host::cut_volume_id(volumes, path));
  }
  EXPECT_NE(std::string::npos, support::syslog_text().find("mount one of them at another path"));
}
