// Configuration files: reading, listing, rewriting.
#include "vorn/config.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <filesystem>

#include "base/text_containers.hpp"
#include "config/config_edit.hpp"
#include "support.hpp"

namespace {

using support::read_file;
using support::write_file;

constexpr const char* kFormat = "\t%s = %s\n";

std::string entries(const VLIBCSzHash& hash) {
  std::string text;
  for (const auto& [key, value] : hash.sorted()) {
    text.append(key).append("=").append(value).append(";");
  }
  return text;
}

class Config : public testing::Test {
 protected:
  support::TempFolder folder;
  std::string file = folder.path("test.conf");
};

}  // namespace

TEST_F(Config, ReadsASection) {
  const struct {
    const char* text;
    const char* entries;
    int line = 0;  // the malformed one; -1: there is no such section
  } cases[] = {{"[p]\na=1\n \tb c =  two words \t\n", "a=1;b c=two words;"},
               {"\xEF\xBB\xBF[p]\r\nkey = v\r\n", "key=v;"},
               {"[o]\na=1\n[ p ]\n# c = 1\n ;x\n\na = b = c\nempty =\n[q]\na=2", "a=b = c;empty=;"},
               {"[o]\nbroken\n[p]\na=1\n[q]\n[broken\n", "a=1;"},  // faults of others don't matter
               {"", "", -1},
               {"[o]\n[p\na = 1\n", "", 2},
               {"[p]\na=1\nnonsense\n", "", 3},
               {"[p]\na=1\n[q]\n[p]\n", "", 4},
               {"[p]\na=1\nb=2\n a =3\n", "", 4},
               {"[p]\n[] \n", "", 2}};
  for (const auto& [text, expected, line] : cases) {
    SCOPED_TRACE(text);
    write_file(file, text);
    const support::Hash owner = support::make_hash();
    VLIBCSzHash* hash = owner.get();
    const auto count = std::count(expected, expected + std::strlen(expected), ';');
    EXPECT_EQ(VLIBCFileGetSection(file.c_str(), "p", &hash), line == 0 ? count : -1);
    EXPECT_EQ(entries(*hash), expected);
    const std::string log = file + ":" + std::to_string(line) + ": malformed line: ";
    EXPECT_EQ(support::syslog_text().substr(0, log.size()), line > 0 ? log : "");
  }
}

TEST_F(Config, RewritesOneSectionAndKeepsEveryOtherByte) {
  const struct {
    const char* before;
    std::vector<std::pair<std::string, std::string>> entries;
    const char* after;
  } cases[] = {
      // changed, removed and new keys, among comments
      {"; top\r\n[o]\n  x  =1\n\n[p]\n# one\na=1\n# two\ngone = 2\n\n b = 3 \n# end\n\n[q]\ny=2",
       {{"a", "new"}, {"b", "3"}, {"z", ""}, {"c", "x = y"}},
       "; top\r\n[o]\n  x  =1\n\n[p]\n# one\n\ta = new\n# two\n\n\tb = 3\n\tc = x = y\n\tz = \n"
       "# end\n\n[q]\ny=2"},
      {"\xEF\xBB\xBF[p]", {{"a", "1"}}, "\xEF\xBB\xBF[p]\n\ta = 1\n"},    // no line end, no keys
      {"[p]\na=1", {{"a", "1"}, {"b", "2"}}, "[p]\n\ta = 1\n\tb = 2\n"},  // last key, no line end
      {"[p]\na=1\n#c\n[q]\na=1\n", {}, "[p]\n#c\n[q]\na=1\n"},            // nothing left
  };
  const std::string link = folder.path("link.conf");
  std::filesystem::create_symlink("test.conf", link);
  for (const auto& [before, entries, after] : cases) {
    SCOPED_TRACE(before);
    write_file(file, before);
    ASSERT_EQ(chmod(file.c_str(), 0640), 0);
    const uid_t owner = chown(file.c_str(), 1234, getegid()) == 0 ? 1234 : geteuid();
    ASSERT_EQ(
        VLIBCFileSetSection(link.c_str(), "p", nullptr, support::make_hash(entries).get(), kFormat),
        0);
    EXPECT_EQ(read_file(file), after);
    const struct stat status = support::status_of(file);
    EXPECT_EQ(status.st_mode, static_cast<mode_t>(S_IFREG | 0640));
    EXPECT_EQ(status.st_uid, owner);
  }
  EXPECT_TRUE(std::filesystem::is_symlink(link));
}

TEST_F(Config, RewritingRefusesWhatWouldNotReadBack) {
  const std::string text = "[p]\na=1\n[twice]\nb=1\nb=2\n";
  write_file(file, text);
  const std::tuple<const char*, const char*, int> cases[] = {
      {"p", "1\nb = 2", VLIBC_ERR_BAD_PARAMETER},
      {"p", " 1", VLIBC_ERR_BAD_PARAMETER},
      {"none", "1", VLIBC_ERR_NO_SECTION},
      {"twice", "1", VLIBC_ERR_MALFORMED_FILE}};
  for (const auto& [section, value, code] : cases) {
    const support::Hash hash = support::make_hash({{"a", value}});
    EXPECT_EQ(VLIBCFileSetSection(file.c_str(), section, nullptr, hash.get(), kFormat), -1);
    EXPECT_EQ(VLIBCErrGet(), code) << section << value;
    EXPECT_EQ(read_file(file), text);
  }
}

// Who writes back what it has read means its own changes: those of others in between stay.
TEST_F(Config, WritingBackKeepsWhatOthersHaveChanged) {
  const std::string before = "[p]\na = 1\nb = 1\nc = 1\nd = 1\n";
  write_file(file, before);
  const support::Hash owner = support::make_hash();
  VLIBCSzHash* hash = owner.get();
  ASSERT_EQ(VLIBCFileGetSection(file.c_str(), "p", &hash), 4);
  hash->remove("a");
  hash->set("b", "mine");
  hash->set("new", "mine");
  write_file(file, "[p]\na = other\nb = other\nc = other\nmore = other\n");  // d is gone
  EXPECT_EQ(VLIBCFileSetSection(file.c_str(), "p", nullptr, hash, kFormat), 0);
  EXPECT_EQ(read_file(file), "[p]\n\tb = mine\n\tc = other\n\tmore = other\n\tnew = mine\n");
  write_file(file, "[q]\nx = 1\n");  // another section gets exactly the entries
  EXPECT_EQ(VLIBCFileSetSection(file.c_str(), "q", nullptr, hash, kFormat), 0);
  EXPECT_EQ(read_file(file), "[q]\n\tb = mine\n\tc = 1\n\td = 1\n\tnew = mine\n");
}

TEST_F(Config, EditsKeepWhatTheyAreNotAbout) {
  using Kind = host::SectionEdit::Kind;
  constexpr const char* kBoth = "# top\n\n# of a\n[a]\n x = 1\n# in a\ny=2\n\n# of b\n[b]\nz=3\n";
  const struct {
    const char* before;
    host::SectionEdit edit;
    std::string after;  // empty: it is refused, and nothing changes
    const char* message = "";
  } cases[] = {
      {"", {Kind::add, "n", {{"k", "v"}, {"e", ""}}}, "[n]\nk = v\ne =\n"},
      {"# c", {Kind::add, "n", {{"k", "v"}, {"u", std::nullopt}}}, "# c\n\n[n]\nk = v\n"},
      {"[o]\r\nx=1\r\n", {Kind::add, "n", {{"k", "v"}}}, "[o]\r\nx=1\r\n\r\n[n]\r\nk = v\r\n"},
      {kBoth,
       {Kind::change, "a", {{"x", "9"}, {"y", std::nullopt}, {"n", "1"}, {"n", "2"}}},
       "# top\n\n# of a\n[a]\n x = 9\n# in a\nn = 2\n\n# of b\n[b]\nz=3\n"},
      {"[a]\r\nx=1", {Kind::change, "a", {{"x", "1"}, {"n", "#"}}}, "[a]\r\nx=1\nn = #\n"},
      {"[a]", {Kind::change, "a", {{"n", "[b]"}}}, "[a]\nn = [b]\n"},
      {kBoth, {Kind::remove, "a", {}}, "# top\n\n# of a\n\n# of b\n[b]\nz=3\n"},
      {kBoth, {Kind::remove, "b", {}}, "# top\n\n# of a\n[a]\n x = 1\n# in a\ny=2\n\n# of b\n"},
      {"\xEF\xBB\xBF[a]\nx=1\n\n\n[b]\n", {Kind::remove, "a", {}}, "\xEF\xBB\xBF[b]\n"},
      {"[c\n[b]\n\n[a]\nx=1", {Kind::remove, "a", {}}, "[c\n[b]\n"},
      {"[a]\n", {Kind::add, "a", {}}, "", "has a section [a] already"},
      {"[a]\n", {Kind::change, "b", {}}, "", "has no section [b]"},
      {"[a]\nx\n", {Kind::remove, "a", {}}, "", ":2: malformed line"},
      {"[a]\n", {Kind::add, "b]", {}}, "", "would not read back"},
      {"[a]\n", {Kind::add, " b", {}}, "", "would not read back"},
      {"[a]\n", {Kind::add, "b\n[a]", {}}, "", "would not read back"},
      {"[a]\n", {Kind::change, "a", {{"k", "1\nl = 2"}}}, "", "would not read back"},
      {"[a]\n", {Kind::change, "a", {{"k", " 1"}}}, "", "would not read back"},
      {"[a]\n", {Kind::change, "a", {{"#k", "1"}}}, "", "would not read back"}};
  for (const auto& [before, edit, after, message] : cases) {
    SCOPED_TRACE(before + edit.section);
    write_file(file, before);
    EXPECT_EQ(host::edit_section(file.c_str(), edit), after.empty() ? -1 : 0);
    EXPECT_EQ(read_file(file), after.empty() ? before : after);
    EXPECT_NE(support::syslog_text().find(message), std::string::npos);
  }
}
