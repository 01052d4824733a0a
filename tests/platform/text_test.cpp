// Text containers, shell quoting, touching files.
#include "vorn/text.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <tuple>

#include "support.hpp"
#include "text_containers.hpp"

TEST(Containers, KeepTheirTextsWhereTheyAre) {
  const support::Hash owner = support::make_hash({{"b", "2"}, {"a", "1"}});
  const support::List list_owner = support::make_list();
  VLIBCSzHash* hash = owner.get();
  VLIBCSzList* list = list_owner.get();
  VLIBCSzListPush(&list, "first");
  const char* kept = VLIBCSzHashGetValue(hash, "a");
  const char* first = VLIBCSzListGet(list, 0);
  for (int i = 0; i < 5000; ++i) {  // well past the slots that were asked for
    ASSERT_EQ(VLIBCSzHashSetValue(&hash, ("key" + std::to_string(i)).c_str(), "x"), 0);
    ASSERT_EQ(VLIBCSzListPush(&list, "more"), 0);
  }
  EXPECT_STREQ(VLIBCSzHashGetValue(hash, "a"), "1");
  EXPECT_STREQ(kept, "1");
  EXPECT_STREQ(first, "first");
  EXPECT_EQ(VLIBCSzListGet(list, -1), nullptr);
  EXPECT_EQ(VLIBCSzListGet(list, VLIBCSzListCount(list)), nullptr);
  EXPECT_EQ(VLIBCSzHashSetValue(&hash, "b", "3"), 0);
  EXPECT_EQ(hash->sorted().at(1), (VLIBCSzHash::Entry{"b", "3"}));
  EXPECT_EQ(VLIBCSzHashGetValue(hash, "B"), nullptr);
  EXPECT_EQ(VLIBCSzHashRemove(&hash, "b"), 1);
  EXPECT_EQ(VLIBCSzHashRemove(&hash, "b"), 0);
}

TEST(Hash, AsksTheResolverOncePerKey) {
  const support::Hash hash = support::make_hash({{"known", "1"}});
  int asked = 0;
  hash->resolve_with([&](std::string_view key) -> std::optional<std::string> {
    ++asked;
    return key == "late" ? std::optional<std::string>("2") : std::nullopt;
  });
  for (int i = 0; i < 3; ++i) {
    EXPECT_STREQ(VLIBCSzHashGetValue(hash.get(), "known"), "1");
    EXPECT_STREQ(VLIBCSzHashGetValue(hash.get(), "late"), "2");
    EXPECT_EQ(VLIBCSzHashGetValue(hash.get(), "never"), nullptr);
  }
  EXPECT_EQ(asked, 2);
  EXPECT_EQ(hash->sorted().size(), 2U);
}

TEST(Hash, FoldsAsciiCaseOnly) {
  const support::Hash owner = support::make_hash({{"JPG", "image"}, {"\xC3\x84", "upper"}});
  VLIBCSzHash* hash = owner.get();
  hash->fold_case();
  EXPECT_STREQ(VLIBCSzHashGetValue(hash, "jPg"), "image");
  EXPECT_EQ(VLIBCSzHashGetValue(hash, "\xC3\xA4"), nullptr);
  EXPECT_EQ(VLIBCSzHashGetValue(hash, "jp"), nullptr);
  EXPECT_EQ(VLIBCSzHashSetValue(&hash, "jpg", "photo"), 0);
  EXPECT_STREQ(VLIBCSzHashGetValue(hash, "JPG"), "photo");
}

TEST(Splitting, KeepsEmptyPiecesAndDropsBlanks) {
  using Pieces = std::vector<std::string>;
  const std::tuple<const char*, const char*, Pieces> cases[] = {
      {"anna,bob", ",", {"anna", "bob"}},
      {" anna , bob smith\t", ",", {"anna", "bob smith"}},
      {"anna,,bob,", ",", {"anna", "", "bob", ""}},
      {"a;b,c", ",;", {"a", "b", "c"}},
      {"a b", " ", {"a", "b"}},
      {"anna", "", {"anna"}},
      {",", ",", {"", ""}},
      {"", ",", {}},
      {" \t ", ",", {}}};
  for (const auto& [text, separators, expected] : cases) {
    const support::List owner = support::make_list();
    VLIBCSzList* list = owner.get();
    VLIBCSzListPush(&list, "kept");
    EXPECT_EQ(VLIBCStrTok(text, separators, &list), static_cast<int>(expected.size())) << text;
    Pieces found = support::texts(owner);
    EXPECT_EQ(found.front(), "kept");
    found.erase(found.begin());
    EXPECT_EQ(found, expected) << text;
  }
}

TEST(ShellQuoting, TheShellReadsBackTheText) {
  for (const std::string text :
       {"", "plain", "two words", "it's", "''", "$HOME `id` \"x\" \\", "new\nline", "\xFF*?[]"}) {
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

TEST(Touch, MakesAFileAndFollowsNoLink) {
  const support::TempFolder folder;
  const std::string path = folder.path("new");
  errno = EXDEV;
  EXPECT_EQ(VLIBCFileTouch(path.c_str()), 0);
  struct stat status {};
  ASSERT_EQ(stat(path.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0600U);
  support::write_file(path, "kept");
  EXPECT_EQ(VLIBCFileTouch(path.c_str()), 0);
  EXPECT_EQ(errno, EXDEV);
  EXPECT_EQ(support::read_file(path), "kept");

  std::filesystem::create_symlink(folder.path("victim"), folder.path("link"));
  EXPECT_EQ(VLIBCFileTouch(folder.path("link").c_str()), -1);
  EXPECT_EQ(errno, ELOOP);
  EXPECT_FALSE(support::exists(folder.path("victim")));
  EXPECT_EQ(VLIBCFileTouch(folder.path("no/such").c_str()), -1);
  EXPECT_EQ(errno, ENOENT);
}
