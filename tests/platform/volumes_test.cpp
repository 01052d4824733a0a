// Which mounts are volumes, what they are called, and what kinds of file systems there are.
#include "volumes.hpp"

#include <gtest/gtest.h>

#include <cstdio>
#include <memory>
#include <set>

#include "file_system.hpp"
#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/volume.h"

namespace {

TEST(FileSystemKind, FollowsStatfsAndTheMountTable) {
  const std::pair<unsigned long, int> magics[] = {
      {0xEF53, VORN_FS_EXT},       {0x58465342, VORN_FS_XFS},    {0x9123683E, VORN_FS_COW},
      {0x2FC12FC1, VORN_FS_COW},   {0x01021994, VORN_FS_MEMORY}, {0x794C7630, VORN_FS_MEMORY},
      {0x6969, VORN_FS_REMOTE},    {0xFF534D42, VORN_FS_REMOTE}, {0x00C36400, VORN_FS_CLUSTER},
      {0x65735546, VORN_FS_OTHER}, {0x9FA0, VORN_FS_OTHER},      {0x4D44, VORN_FS_OTHER}};
  for (const auto& [magic, kind] : magics) {
    EXPECT_EQ(kind, host::kind_of_magic(magic)) << std::hex << magic;
  }
  const std::pair<const char*, int> names[] = {
      {"ext4", VORN_FS_EXT},    {"fuse.glusterfs", VORN_FS_CLUSTER}, {"fuse.sshfs", VORN_FS_OTHER},
      {"nfs4", VORN_FS_REMOTE}, {"squashfs", VORN_FS_OTHER},         {"devtmpfs", VORN_FS_OTHER},
      {"", VORN_FS_OTHER}};
  for (const auto& [name, kind] : names) {
    EXPECT_EQ(kind, host::kind_of_name(name)) << name;
  }
  EXPECT_EQ(VORN_FS_OTHER, VORNGetFSType("/proc", 0));
  EXPECT_TRUE(host::is_walked(static_cast<VornFsKind>(VORNGetFSType("/tmp", 0))));
  EXPECT_EQ(-1, VORNGetFSType("/no/such/path", 0));
  EXPECT_EQ(-1, VORNGetFSType(nullptr, 0));
}

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
  EXPECT_TRUE(mounts_of("").empty());
  EXPECT_TRUE(host::read_mounts("/no/such/table").empty());
}

TEST(Volumes, OfAContainerAreWhereTheSharesAre) {
  auto mounts = mounts_of(
      "1 0 0:90 / / rw - overlay overlay rw\n"
      "2 1 8:1 /var/lib/c/hosts /etc/hosts rw - ext4 /dev/sda1 rw\n"
      "3 1 8:1 /etc /etc rw - ext4 /dev/sda1 rw\n"
      "4 1 8:1 /export /srv/share rw - ext4 /dev/sda1 rw\n"
      "5 1 0:91 / /memory rw - tmpfs tmpfs rw\n");
  ASSERT_EQ(5U, mounts.size());
  mounts[1].is_folder = false;
  EXPECT_EQ((std::vector<std::string>{"/", "/etc", "/memory (no data)"}),
            paths_of(host::choose_volumes(mounts)));
  mounts[3].holds_share = true;
  mounts[4].holds_share = true;
  EXPECT_EQ((std::vector<std::string>{"/", "/srv/share", "/memory"}),
            paths_of(host::choose_volumes(mounts)));
}

TEST(Volumes, OfThisServerHoldItsShares) {
  support::write_file(VORN_PATH_SHARES,
                      "[tmp]\npath = /tmp\n[proc]\npath = /proc\n[gone]\npath = /no/such\n"
                      "[bad]\npath = rel\n");
  EXPECT_TRUE(support::passes_in_child([] {
    VLIBCSzHash* hash = nullptr;
    EXPECT_EQ(0, VornQazGetVolumePathHash(&hash));
    const support::Hash owner(hash);
    EXPECT_STREQ("/tmp", VLIBCSzHashGetValue(hash, "tmp"));
    for (const char* share : {"proc", "gone", "bad"}) {
      EXPECT_EQ(nullptr, VLIBCSzHashGetValue(hash, share)) << share;
    }
  }));
}

TEST(VolumeSpace, IsWhatDfCounts) {
  struct Case {
    unsigned long blocks, free, available;
    host::Space expected;
  };
  const Case cases[] = {
      {1000, 400, 400, {4096000, 1638400}},
      {1000, 400, 350, {3891200, 1433600}},  // 50 blocks are reserved for root
      {1000, 30, 0, {3973120, 0}},
      {1000, 30, static_cast<unsigned long>(-20), {3973120, 0}},
      {1000, 1200, 1200, {4915200, 4915200}},
      {0, 0, 0, {0, 0}},
  };
  for (const auto& [blocks, free, available, expected] : cases) {
    struct statvfs measured {};
    measured.f_bsize = 65536;
    measured.f_frsize = 4096;
    measured.f_blocks = blocks;
    measured.f_bfree = free;
    measured.f_bavail = available;
    const host::Space space = host::space_of(measured);
    EXPECT_EQ(expected.total, space.total);
    EXPECT_EQ(expected.free, space.free);
  }
}

// What df says about the file system at `path`: "used available percent%".
std::string df(const std::string& path) {
  FILE* tool = popen(("/usr/bin/df -B1 --output=used,avail,pcent " + path).c_str(), "r");
  char line[256] = "";
  unsigned long long used = 0;
  unsigned long long available = 0;
  unsigned percent = 0;
  while (std::fgets(line, sizeof line, tool) != nullptr) {
    std::sscanf(line, "%llu %llu %u", &used, &available, &percent);
  }
  pclose(tool);
  return std::to_string(used) + " " + std::to_string(available) + " " + std::to_string(percent);
}

std::string described(const VORNMountVolInfo& volume) {
  const unsigned long long used = volume.total_size - volume.free_size;
  const unsigned long long percent = (used * 100 + volume.total_size - 1) / volume.total_size;
  return std::to_string(used) + " " + std::to_string(volume.free_size) + " " +
         std::to_string(percent);
}

// The sandbox of this test has two small file systems in memory; shares make them volumes.
TEST(Volumes, AreListedOnceWithWhatDfSays) {
  const std::string first = "/tmp/vol-storage-1";
  const std::string second = "/tmp/vol-storage-2";
  support::write_file(first + "/file", std::string(1000000, 'x'));
  support::write_file(VORN_PATH_SHARES, "[one]\npath = " + first + "\n[two]\npath = " + second +
                                            "\n[again]\npath = " + second + "\n");
  EXPECT_TRUE(support::passes_in_child([&] {
    const std::unique_ptr<VORNMountVolInfo, decltype(&VORNMountVolInfoFree)> volumes(
        VORNMountVolAllEnum(nullptr, VORN_VOLUMES_OF_USAGE), &VORNMountVolInfoFree);
    std::multiset<std::string> paths;
    for (const auto* volume = volumes.get(); volume != nullptr; volume = volume->next) {
      paths.insert(volume->path);
      if (volume->path == first || volume->path == second) {
        EXPECT_EQ(df(volume->path), described(*volume)) << volume->path;
      }
    }
    for (const std::string& path : {std::string("/"), first, second}) {
      EXPECT_EQ(1U, paths.count(path)) << path;
    }
    for (const char* path : {"/proc", "/dev", "/tmp", "/run"}) {
      EXPECT_EQ(0U, paths.count(path)) << path;
    }
    char id[64];
    EXPECT_LT(0, VornQazVolumeGetId("/tmp/vol-storag", id, sizeof id));
    EXPECT_STREQ("/tmp/vol-storag...", id);
  }));
  VORNMountVolInfoFree(nullptr);
  EXPECT_EQ(nullptr, VORNMountVolAllEnum("filter", VORN_VOLUMES_OF_USAGE));
}

TEST(VolumeId, IsSafeShortAndUnique) {
  const std::string plain48 = "/" + std::string(47, 'v');
  EXPECT_EQ("/", host::volume_id("/"));
  EXPECT_EQ("/srv/data-1_2.x", host::volume_id("/srv/data-1_2.x"));
  EXPECT_EQ(plain48, host::volume_id(plain48));
  EXPECT_EQ("/srv/a_b-47bf2a0c", host::volume_id("/srv/a b")) << "stored from run to run";

  const std::string hostile[] = {"/srv/a b",    "/srv/a'b",    "/srv/a\"b",
                                 "/srv/a\\b",   "/srv/a\nb",   "/srv/a\xff",
                                 plain48 + "1", plain48 + "2", "/" + std::string(4000, 'x')};
  std::set<std::string> ids;
  for (const std::string& path : hostile) {
    const std::string id = host::volume_id(path);
    EXPECT_LE(id.size(), 48U);
    EXPECT_EQ(std::string::npos,
              id.find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz"
                                   "0123456789._-/"))
        << id;
    ids.insert(id);
  }
  EXPECT_EQ(std::size(hostile), ids.size());
}

TEST(VolumeId, OfACutPathIsThatOfTheVolume) {
  const std::vector<host::Volume> volumes = {
      {1, "/srv/storage/projects", VORN_FS_EXT, true},
      {2, "/srv/storage/private", VORN_FS_EXT, true},
      {3, "/srv/storage/p", VORN_FS_EXT, true},
      {4, "/srv/storage/archive/of/every thing", VORN_FS_EXT, true},
      {5, "/srv/storage/backup", VORN_FS_EXT, true},
      {6, "/srv/storage/backup/layer", VORN_FS_MEMORY, false}};
  const std::pair<const char*, const char*> cases[] = {
      {"/srv/storage/pr", "/srv/storage/pr..."},  // nobody can tell which of the two
      {"/srv/storage/p", "/srv/storage/p..."},    // its own path is no proof either
      {"/srv/storage/archive/of/every t", "/srv/storage/archive/of/every_thing-5e547bb7"},
      {"/srv/storage/ba", "/srv/storage/backup"},  // the layer is no volume of the reports
      {"/srv/storage/xx", "/srv/storage/xx"}};
  for (const auto& [path, expected] : cases) {
    EXPECT_EQ(expected, host::cut_volume_id(volumes, path));
  }
  const auto lines = support::syslog_lines();
  ASSERT_EQ(2U, lines.size());
  EXPECT_EQ(
      "volumes \"/srv/storage/projects\" and \"/srv/storage/private\" have the first 15 bytes "
      "in common, so that reports can't tell them apart and call both /srv/storage/pr...; "
      "mount one of them at another path",
      lines[0]);
  EXPECT_TRUE(host::may_be_cut("/srv/storage/pr"));
  EXPECT_FALSE(host::may_be_cut("/srv/storage/p"));

  char id[64];
  EXPECT_EQ(15, VornQazVolumeGetId("/no/such/volume", id, sizeof id));
  EXPECT_STREQ("/no/such/volume", id);
  EXPECT_EQ(-1, VornQazVolumeGetId("", id, sizeof id));
  EXPECT_EQ(-1, VornQazVolumeGetId(nullptr, id, sizeof id));
  EXPECT_EQ(-1, VornQazVolumeGetId("/", id, 63));
}

}  // namespace
