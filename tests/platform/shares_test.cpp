// Shares, the accounts that own their files, and the selection of a profile.
#include "shares.hpp"

#include <gtest/gtest.h>

#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vorn/share.h"
#include "vorn/user.h"
#include "vorn/volume.h"

using support::make_hash;

namespace {

TEST(ShareName, RefusesWhatTheReportsCannotCarry) {
  const std::string longest(64, 'x');
  for (const std::string& name :
       {std::string("photos"), std::string("My files"), std::string("a.b-c_d"), longest,
        std::string("2024 photos"), std::string("1e"), std::string("0x1F"), std::string("1.2.3"),
        std::string("B\xc3\xbc"
                    "ro"),
        std::string("__proto__"), std::string("a&b")}) {
    EXPECT_EQ(nullptr, host::share_name_error(name)) << name;
  }
  for (const std::string& name : {std::string(),
                                  longest + "x",
                                  std::string("a'b"),
                                  std::string("a\"b"),
                                  std::string("a`b"),
                                  std::string("a\\b"),
                                  std::string("a<b"),
                                  std::string("a>b"),
                                  std::string("a/b"),
                                  std::string("a,b"),
                                  std::string("a\tb"),
                                  std::string("a\x7f"),
                                  std::string("a\xc2\x85"),
                                  std::string("\xff"),
                                  std::string("007"),
                                  std::string("1e5"),
                                  std::string(".5"),
                                  std::string("5."),
                                  std::string("1.5E-3"),
                                  std::string(" 12 "),
                                  std::string("=x"),
                                  std::string("+x"),
                                  std::string("-x"),
                                  std::string("@x")}) {
    EXPECT_NE(nullptr, host::share_name_error(name)) << name;
  }
}

// Each in a process of its own, since the file is read once.
int in_fresh_process(const std::function<void()>& check) {
  return support::wait_child(support::fork_child([&check] {
    check();
    return testing::Test::HasFailure() ? 1 : 0;
  }));
}

TEST(Shares, AreReadWithTheirPathsAndIndexes) {
  const std::string long_path = "/" + std::string(2048, 'p');
  support::write_file(VORN_PATH_SHARES,
                      "[photos]\npath = /srv/photos//\n[indexed]\npath = /srv/i\n"
                      "file_index = /var/i.db\n[badindex]\npath = /b\nfile_index = i.db\n"
                      "[007]\npath = /srv/bond\n[root]\npath = /\n[twice]\npath = /1\npath = /2\n"
                      "[none]\n[relative]\npath = srv\n[quote]\npath = /it's\n[long]\npath = " +
                          long_path + "\n");
  EXPECT_EQ(
      0, in_fresh_process([] {
        const support::List list = support::make_list();
        VLIBCSzList* filled = list.get();
        EXPECT_EQ(8, VORNShareEnum(&filled, VORN_SHARE_ENUM_ALL));
        EXPECT_EQ((std::vector<std::string>{"photos", "indexed", "badindex", "root", "none",
                                            "relative", "quote", "long"}),
                  support::texts(list));
        const std::string log = support::syslog_text();
        EXPECT_NE(std::string::npos, log.find("\"007\"")) << log;
        EXPECT_NE(std::string::npos, log.find("twice")) << log;
        EXPECT_EQ(2, 1 + std::count(log.begin(), log.end(), '\n')) << log;

        const std::pair<const char*, const char*> paths[] = {
            {"photos", "/srv/photos"}, {"root", "/"}, {"indexed", "/srv/i"}};
        char path[4096];
        for (const auto& [share, expected] : paths) {
          EXPECT_EQ(0, VORNSharePathGet(share, path, sizeof path));
          EXPECT_STREQ(expected, path);
        }
        for (const char* share : {"none", "relative", "quote", "long", "007", "twice", "unknown"}) {
          EXPECT_EQ(-1, VORNSharePathGet(share, path, sizeof path)) << share;
          EXPECT_EQ(1U, support::syslog_lines().size()) << share;
        }
        EXPECT_EQ(-1, VORNSharePathGet("photos", path, 5));

        EXPECT_NE(0, VORNShareFileIndexIsEnabled("indexed"));
        EXPECT_EQ(0, VORNShareFileIndexIsEnabled("photos"));
        EXPECT_EQ(0, VORNShareFileIndexDBPathGet("indexed", path, sizeof path));
        EXPECT_STREQ("/var/i.db", path);
        EXPECT_EQ(-1, VORNShareFileIndexDBPathGet("badindex", path, sizeof path));
        EXPECT_EQ(-1, VORNShareFileIndexDBPathGet("photos", path, sizeof path));

        const support::Hash hash = make_hash();
        VLIBCSzHash* folders = hash.get();
        EXPECT_EQ(4, VornQazGetSharePathHash(&folders));
        EXPECT_STREQ("/srv/photos", VLIBCSzHashGetValue(folders, "photos"));
        EXPECT_EQ(nullptr, VLIBCSzHashGetValue(folders, "quote"));
      }));
}

TEST(Shares, CannotBeEnumeratedWithoutTheirFile) {
  std::remove(VORN_PATH_SHARES);
  EXPECT_EQ(0, in_fresh_process([] {
              const support::List list = support::make_list();
              VLIBCSzList* filled = list.get();
              EXPECT_EQ(-1, VORNShareEnum(&filled, VORN_SHARE_ENUM_ALL));
              EXPECT_NE(std::string::npos, support::syslog_text().find(VORN_PATH_SHARES));
              VLIBCSzHash* volumes = nullptr;
              EXPECT_EQ(-1, VornQazGetVolumePathHash(&volumes));
              EXPECT_EQ(nullptr, volumes);
            }));
}

TEST(MatchShare, ReadsTheListAsNames) {
  struct Case {
    const char* list;
    const char* share;
    bool expected;
  };
  const Case cases[] = {
      {nullptr, "photos", true},
      {"", "photos", true},
      {" ", "photos", true},
      {"photos", "photos", true},
      {"a, photos ,b", "photos", true},
      {"a,\tMy files", "My files", true},
      {"photos2", "photos", false},
      {"my photos", "photos", false},
      {"a,b", "photos", false},
      {"Photos", "photos", false},
      {",,photos,", "photos", true},
  };
  for (const auto& [list, share, expected] : cases) {
    const support::Hash hash = list == nullptr ? make_hash() : make_hash({{"share_list", list}});
    EXPECT_EQ(expected, VornQazMatchShare(hash.get(), share) != 0) << (list ? list : "unset");
  }
}

}  // namespace
