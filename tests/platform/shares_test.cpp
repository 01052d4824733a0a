// Shares, and the selection of a profile.
#include "shares.hpp"

#include <gtest/gtest.h>

#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vorn/share.h"
#include "vorn/volume.h"

using support::make_hash;

namespace {

TEST(ShareName, RefusesWhatTheReportsCannotCarry) {
  const std::string longest(64, 'x');
  const std::string good[] = {"photos",
                              "My files",
                              "a.b-c_d",
                              longest,
                              "2024 photos",
                              "1e",
                              "0x1F",
                              "1.2.3",
                              "B\xc3\xbc"
                              "ro",
                              "__proto__",
                              "a&b"};
  for (const std::string& name : good) {
    EXPECT_EQ(nullptr, host::share_name_error(name)) << name;
  }
  const std::string bad[] = {"",          longest + "x", "a'b", "a\"b", "a`b",  "a\\b",
                             "a<b",       "a>b",         "a/b", "a,b",  "a\tb", "a\x7f",
                             "a\xc2\x85", "\xff",        "007", "1e5",  ".5",   "5.",
                             "1.5E-3",    " 12 ",        "=x",  "+x",   "-x",   "@x"};
  for (const std::string& name : bad) {
    EXPECT_NE(nullptr, host::share_name_error(name)) << name;
  }
}

TEST(Shares, AreReadWithTheirPathsAndIndexes) {
  support::write_file(VORN_PATH_SHARES,
                      "[photos]\npath = /srv/photos//\n[indexed]\npath = /srv/i\n"
                      "file_index = /var/i.db\n[badindex]\npath = /b\nfile_index = i.db\n"
                      "[007]\npath = /srv/bond\n[root]\npath = /\n[twice]\npath = /1\npath = /2\n"
                      "[none]\n[relative]\npath = srv\n[quote]\npath = /it's\n[long]\npath = /" +
                          std::string(2048, 'p') + "\n");
  EXPECT_TRUE(support::passes_in_child([] {  // since the file is read once
    const support::List list = support::make_list();
    VLIBCSzList* filled = list.get();
    EXPECT_EQ(8, VORNShareEnum(&filled, VORN_SHARE_ENUM_ALL));
    EXPECT_EQ((std::vector<std::string>{"photos", "indexed", "badindex", "root", "none", "relative",
                                        "quote", "long"}),
              support::texts(list));
    const std::vector<std::string> log = support::syslog_lines();
    EXPECT_EQ(2U, log.size());
    EXPECT_NE(std::string::npos, log[0].find("\"007\"")) << log[0];
    EXPECT_NE(std::string::npos, log[1].find("twice")) << log[1];

    const std::pair<const char*, const char*> paths[] = {{"photos", "/srv/photos"},
                                                         {"root", "/"},
                                                         {"none", ""},
                                                         {"relative", ""},
                                                         {"quote", ""},
                                                         {"long", ""},
                                                         {"007", ""},
                                                         {"twice", ""},
                                                         {"unknown", ""}};
    char path[4096];
    for (const auto& [share, expected] : paths) {
      *path = '\0';
      EXPECT_EQ(*expected == '\0' ? -1 : 0, VORNSharePathGet(share, path, sizeof path)) << share;
      EXPECT_STREQ(expected, path);
      EXPECT_EQ(*expected == '\0' ? 1U : 0U, support::syslog_lines().size()) << share;
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
  EXPECT_TRUE(support::passes_in_child([] {
    VLIBCSzHash* volumes = nullptr;
    EXPECT_EQ(-1, VornQazGetVolumePathHash(&volumes));
    EXPECT_EQ(nullptr, volumes);
    EXPECT_NE(std::string::npos, support::syslog_text().find(VORN_PATH_SHARES));
  }));
}

TEST(MatchShare, ReadsTheListAsNames) {
  const std::pair<const char*, bool> cases[] = {
      {"", true},          {" ", true},        {"photos", true},     {"a, photos ,b", true},
      {",,photos,", true}, {"photos2", false}, {"my photos", false}, {"a,b", false},
      {"Photos", false}};
  for (const auto& [list, expected] : cases) {
    const support::Hash hash = make_hash({{"share_list", list}});
    EXPECT_EQ(expected, VornQazMatchShare(hash.get(), "photos") != 0) << list;
  }
  EXPECT_NE(0, VornQazMatchShare(make_hash().get(), "photos"));
}

}  // namespace
