// Which mounts are volumes, what they are called, and what kinds of file systems there are.
#include "volumes.hpp"

#include <gtest/gtest.h>

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
  EXPECT_EQ(0, support::wait_child(support::fork_child([] {
              VLIBCSzHash* hash = nullptr;
              EXPECT_EQ(0, VornQazGetVolumePathHash(&hash));
              const support::Hash owner(hash);
              EXPECT_STREQ("/tmp", VLIBCSzHashGetValue(hash, "tmp"));
              for (const char* share : {"proc", "gone", "bad"}) {
                EXPECT_EQ(nullptr, VLIBCSzHashGetValue(hash, share)) << share;
              }
              return testing::Test::HasFailure() ? 1 : 0;
            })));
}

TEST(VolumeId, IsSafeShortAndUnique) {
  const std::string plain48 = "/" + std::string(47, 'v');
  EXPECT_EQ("/", host::volume_id("/"));
  EXPECT_EQ("/srv/data-1_2.x", host::volume_id("/srv/data-1_2.x"));
  EXPECT_EQ(plain48, host::volume_id(plain48));
  EXPECT_EQ("/srv/a_b-47bf2a0c", host::volume_id("/srv/a b")) << "stored from run to run";

  const std::string hostile[] = {"/srv/a b",
                                 "/srv/a'b",
                                 "/srv/a\"b",
                                 "/srv/a\\b",
                                 "/srv/a\nb",
                                 "/srv/a\xff"
                                 "b",
                                 plain48 + "1",
                                 plain48 + "2",
                                 "/" + std::string(4000, 'x')};
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
      {4, "/srv/storage/archive/of/everything/old", VORN_FS_EXT, true}};
  const std::pair<const char*, const char*> cases[] = {
      {"/srv/storage/pr", "/srv/storage/projects"},  // both begin so: the first in mount order
      {"/srv/storage/p", "/srv/storage/p"},
      {"/srv/storage/archive/of/everyth", "/srv/storage/archive/of/everything/old"},
      {"/srv/storage/xx", "/srv/storage/xx"}};
  for (const auto& [path, expected] : cases) {
    EXPECT_EQ(expected, host::uncut_path(volumes, path));
  }
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
