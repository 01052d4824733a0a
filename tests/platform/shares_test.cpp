// Shares, and the selection of a profile.
#include "config/shares.hpp"

#include <gtest/gtest.h>

#include "machine/file_system.hpp"
#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vorn/share.h"

using support::make_hash;

namespace {

TEST(ShareName, RefusesWhatTheReportsCannotCarry) {
  const std::string longest(64, 'x');
  for (const std::string& name : {std::string("My files"), std::string("a.b-c_d"), longest,
                                  std::string("2024 photos"), std::string("__proto__")}) {
    EXPECT_EQ(nullptr, host::share_name_error(name)) << name;
  }
  const std::string bad[] = {"",    longest + "x", "a'b",  "a\"b", "a`b", "a\\b",   "a<b",
                             "a/b", "a,b",         "a\tb", "\xff", "007", "1.5E-3", "=x"};
  for (const std::string& name : bad) {
    EXPECT_NE(nullptr, host::share_name_error(name)) << name;
  }
}

TEST(Shares, AreReadWithTheirPaths) {
  support::write_file(VORN_PATH_SHARES,
                      "[photos]\npath = /srv/photos//\n"
                      "[007]\npath = /srv/bond\n[twice]\npath = /1\npath = /2\n"
                      "[none]\n[relative]\npath = srv\n[quote]\npath = /it's\n");
  ASSERT_NE(nullptr, host::read_shares());
  const support::List list = support::make_list();
  VLIBCSzList* filled = list.get();
  EXPECT_EQ(4, VORNShareEnum(&filled, VORN_SHARE_ENUM_ALL));
  EXPECT_EQ((std::vector<std::string>{"photos", "none", "relative", "quote"}),
            support::texts(list));
  EXPECT_EQ(3U, support::syslog_lines().size()) << "one for 007, two for twice";
  const std::pair<const char*, const char*> paths[] = {{"photos", "/srv/photos"},
                                                       {"none", ""},
                                                       {"relative", ""},
                                                       {"quote", ""},
                                                       {"007", ""},
                                                       {"twice", ""},
                                                       {"unknown", ""}};
  char path[4096];
  for (const auto& [share, expected] : paths) {
    *path = '\0';
    EXPECT_EQ(*expected == '\0' ? -1 : 0, VORNSharePathGet(share, path, sizeof path)) << share;
    EXPECT_STREQ(expected, path);
  }
}

TEST(Shares, AreWalkedOnTheNetworkWhenTheySaySo) {
  support::write_file(VORN_PATH_SHARES,
                      "[nas]\npath = /mnt/nas\nnetwork = Yes\n[local]\npath = /mnt\nnetwork = no\n"
                      "[odd]\npath = /mnt/nas\nnetwork = 1\n[all]\npath = /\nnetwork = yes\n");
  ASSERT_NE(nullptr, host::read_shares());
  EXPECT_EQ(VORN_FS_REMOTE, host::kind_in_walk(VORN_FS_REMOTE, "/mnt/nas")) << "no share yet";
  const struct {
    const char* share;
    const char* path;
    bool is_walked;
  } cases[] = {{"nas", "/mnt/nas", true},   {"nas", "/mnt/nas/deep", true},
               {"nas", "/mnt/nas2", false}, {"local", "/mnt/nas", false},
               {"odd", "/mnt/nas", false},  {"all", "/mnt/nas", true}};
  char path[4096];
  for (const auto& [share, asked, is_walked] : cases) {
    EXPECT_EQ(0, VORNSharePathGet(share, path, sizeof path));
    EXPECT_EQ(is_walked, host::is_walked(host::kind_in_walk(VORN_FS_REMOTE, asked))) << asked;
    EXPECT_EQ(VORN_FS_OTHER, host::kind_in_walk(VORN_FS_OTHER, asked));
  }
  EXPECT_NE(std::string::npos, support::syslog_text().find("neither yes nor no"));
}

TEST(MatchShare, ReadsTheListAsNames) {
  const std::pair<const char*, bool> cases[] = {{" ", true},
                                                {"a, photos ,b", true},
                                                {",,photos,", true},
                                                {"photos2", false},
                                                {"my photos", false}};
  for (const auto& [list, expected] : cases) {
    const support::Hash hash = make_hash({{"share_list", list}});
    EXPECT_EQ(expected, VornQazMatchShare(hash.get(), "photos") != 0) << list;
  }
  EXPECT_NE(0, VornQazMatchShare(make_hash().get(), "photos"));
}

}  // namespace
