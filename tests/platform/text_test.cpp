// Splitting, shell quoting, touching files.
#include "vorn/text.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>

#include "support.hpp"

TEST(Splitting, KeepsEmptyPiecesAndDropsBlanks) {
  const std::pair<const char*, std::vector<std::string>> cases[] = {
      {" anna ; bob smith\t", {"anna", "bob smith"}}, {"anna,,", {"anna", "", ""}}, {" \t ", {}}};
  for (const auto& [text, expected] : cases) {
    const support::List owner = support::make_list();
    VLIBCSzList* list = owner.get();
    EXPECT_EQ(VLIBCStrTok(text, ",;", &list), static_cast<int>(expected.size())) << text;
    EXPECT_EQ(support::texts(owner), expected) << text;
  }
}

TEST(ShellQuoting, TheShellReadsBackTheText) {
  for (const std::string text : {"", "two words", "it's", "$HOME `id` \"x\" \\", "\n\xFF*?[]"}) {
    char quoted[128];
    const int length = VLIBCEncShParam(text.c_str(), quoted, sizeof quoted);
    ASSERT_EQ(length, static_cast<int>(std::string_view(quoted).size())) << text;
    FILE* shell = popen(("printf %s " + std::string(quoted)).c_str(), "r");
    char back[128];
    const std::size_t size = fread(back, 1, sizeof back, shell);
    pclose(shell);
    EXPECT_EQ(std::string(back, size), text);
    EXPECT_EQ(VLIBCEncShParam(text.c_str(), quoted, static_cast<size_t>(length) + 1), length);
    EXPECT_EQ(VLIBCEncShParam(text.c_str(), quoted, static_cast<size_t>(length)), -1);
    EXPECT_STREQ(quoted, "");
  }
}

TEST(Touch, MakesAPrivateFileAndFollowsNoLink) {
  const support::TempFolder folder;
  const std::string path = folder.path("new");
  EXPECT_EQ(VLIBCFileTouch(path.c_str()), 0);
  EXPECT_EQ(std::filesystem::status(path).permissions(), std::filesystem::perms(0600));
  support::write_file(path, "kept");
  EXPECT_EQ(VLIBCFileTouch(path.c_str()), 0);
  EXPECT_EQ(support::read_file(path), "kept");
  std::filesystem::create_symlink(folder.path("victim"), folder.path("link"));
  EXPECT_EQ(VLIBCFileTouch(folder.path("link").c_str()), -1);
  EXPECT_EQ(errno, ELOOP);
  EXPECT_FALSE(support::exists(folder.path("victim")));
}
