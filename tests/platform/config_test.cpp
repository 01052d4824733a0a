// Configuration files: reading, listing, rewriting.
#include "vorn/config.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <filesystem>

#include "config_file.hpp"
#include "support.hpp"
#include "text_containers.hpp"

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
    const char* log;  // what follows the file's path; of a missing section: "-"
  } cases[] = {
      {"[p]\na=1\n \tb c =  two words \t\n", "a=1;b c=two words;", ""},
      {"\xEF\xBB\xBF[p]\r\nkey = v\r\n", "key=v;", ""},
      {"[o]\na=1\n[ p ]\n# c = 1\n ;x\n\na = b = c\nempty =\n[q]\na=2", "a=b = c;empty=;", ""},
      {"[p]", "", ""},
      {"[p]\nn = \xC3\xA4\xFF", "n=\xC3\xA4\xFF;", ""},
      {"[o]\nbroken\n[p]\na=1\n[q]\n[broken\n", "a=1;", ""},  // faults of others don't matter
      {"", "", "-"},
      {"a = 1\n[o]\n", "", "-"},
      {"[o]\n[p\na = 1\n", "",
       ":2: malformed line: a section header is [name] and nothing behind it; correct the line"},
      {"[p]\na=1\nnonsense\n", "",
       ":3: malformed line: it is no [section], key = value or # comment; correct the line"},
      {"[p]\n= v\n", "",
       ":2: malformed line: a key is not empty and has no control character; correct the line"},
      {"[p]\na=1\n[q]\n[p]\n", "",
       ":4: malformed line: a section of this name stands above already; correct the line"},
      {"[p]\na=1\nb=2\n a =3\n", "",
       ":4: malformed line: this key stands in the section twice; correct the line"},
      {"[p]\n[] \n", "",
       ":2: malformed line: a section name is not empty and has no bracket or control character; "
       "correct the line"},
  };
  for (const auto& [text, expected, log] : cases) {
    SCOPED_TRACE(text);
    write_file(file, text);
    const support::Hash owner = support::make_hash();
    VLIBCSzHash* hash = owner.get();
    const auto count = std::count(expected, expected + std::strlen(expected), ';');
    EXPECT_EQ(VLIBCFileGetSection(file.c_str(), "p", &hash), *log == '\0' ? count : -1);
    EXPECT_EQ(entries(*hash), expected);
    EXPECT_EQ(support::syslog_text(), std::strlen(log) < 2 ? "" : file + log);
  }
}

TEST_F(Config, RefusesWhatItCannotRead) {
  std::filesystem::create_directory(folder.path("dir"));
  ASSERT_EQ(mkfifo(folder.path("pipe").c_str(), 0600), 0);
  write_file(folder.path("zero"), std::string("[p]\na=\0b\n", 9));
  write_file(folder.path("huge"), "[p]\n" + std::string(17U << 20U, '#'));
  for (const char* name : {"absent", "dir", "pipe", "zero", "huge"}) {
    SCOPED_TRACE(name);
    const support::Hash owner = support::make_hash({{"old", "1"}});
    VLIBCSzHash* hash = owner.get();
    EXPECT_EQ(VLIBCFileGetSection(folder.path(name).c_str(), "p", &hash), -1);
    EXPECT_EQ(entries(*hash), "old=1;");
    EXPECT_EQ(support::syslog_text().find(folder.path(name)), 0U);
  }
}

TEST_F(Config, ListsSectionsInFileOrder) {
  write_file(file, "# [no]\n[z]\na=[x]\n[ a b ]\n[broken\n[z2]");
  const support::List owner = support::make_list();
  VLIBCSzList* list = owner.get();
  EXPECT_EQ(VLIBCFileEnumSection(file.c_str(), &list), 3);
  EXPECT_EQ(support::texts(owner), (std::vector<std::string>{"z", "a b", "z2"}));
  EXPECT_EQ(support::syslog_lines().size(), 1U);
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
      {"[p]\na=1\n#c\nb=2\n", {{"n", "1"}}, "[p]\n#c\n\tn = 1\n"},        // nothing kept
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
    struct stat status {};
    ASSERT_EQ(lstat(file.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode, static_cast<mode_t>(S_IFREG | 0640));
    EXPECT_EQ(status.st_uid, owner);
  }
  EXPECT_TRUE(std::filesystem::is_symlink(link));
}

TEST_F(Config, RewritingRefusesWhatWouldNotReadBack) {
  const std::string text = "[p]\na=1\n[twice]\nb=1\nb=2\n";
  write_file(file, text);
  const struct {
    const char* section;
    const char* key;
    const char* value;
    const char* format = kFormat;
    int code = VLIBC_ERR_BAD_PARAMETER;
  } cases[] = {{"p", "a", "1\nb = 2"},
               {"p", "a", "1\r"},
               {"p", "a", " 1"},
               {"p", "a=b", "1"},
               {"p", "#a", "1"},
               {"p", "[a]", "1"},
               {"p", "", "1"},
               {"p", "a", "1", "%s = %s"},
               {"p", "a", "1", "%s = %s %n\n"},
               {"p", "a", "1", "%s\n"},
               {"none", "a", "1", kFormat, VLIBC_ERR_NO_SECTION},
               {"twice", "a", "1", kFormat, VLIBC_ERR_MALFORMED_FILE}};
  for (const auto& [section, key, value, format, code] : cases) {
    SCOPED_TRACE(std::string(section) + " " + key + " " + value + " " + format);
    const support::Hash hash = support::make_hash({{key, value}});
    EXPECT_EQ(VLIBCFileSetSection(file.c_str(), section, nullptr, hash.get(), format), -1);
    EXPECT_EQ(VLIBCErrGet(), code);
    EXPECT_EQ(support::syslog_lines().size(), 1U);
    EXPECT_EQ(read_file(file), text);
  }
}

TEST_F(Config, TwoWritersLoseNothing) {
  write_file(file, "[left]\nn = 0\n# between\n[right]\nn = 0\n");
  const auto write_rounds = [this](const char* section) {
    int result = 0;
    for (int i = 1; i <= 50; ++i) {
      const support::Hash hash = support::make_hash({{"n", std::to_string(i)}});
      result |= VLIBCFileSetSection(file.c_str(), section, nullptr, hash.get(), kFormat);
    }
    return result;
  };
  const pid_t child = support::fork_child([&] { return write_rounds("left"); });
  EXPECT_EQ(write_rounds("right"), 0);
  EXPECT_EQ(support::wait_child(child), 0);
  EXPECT_EQ(read_file(file), "[left]\n\tn = 50\n# between\n[right]\n\tn = 50\n");
  const auto names = std::filesystem::directory_iterator(folder.path());
  EXPECT_EQ(std::distance(begin(names), end(names)), 2);  // file and lock, nothing temporary
}

TEST_F(Config, GivesUpOnABusyOrPlantedLock) {
  write_file(file, "[p]\na=1\n");
  const std::string lock = folder.path(".test.conf.lock");
  const support::Hash hash = support::make_hash();
  const auto rewrite = [&] {
    return host::set_section(file.c_str(), "p", *hash, kFormat, std::chrono::milliseconds(50));
  };
  const int fd = open(lock.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  ASSERT_EQ(flock(fd, LOCK_EX), 0);
  EXPECT_EQ(rewrite(), -1);
  EXPECT_EQ(VLIBCErrGet(), VLIBC_ERR_LOCK_BUSY);
  close(fd);
  unlink(lock.c_str());
  std::filesystem::create_symlink(folder.path("victim"), lock);
  EXPECT_EQ(rewrite(), -1);
  EXPECT_FALSE(support::exists(folder.path("victim")));
  EXPECT_EQ(read_file(file), "[p]\na=1\n");
}
