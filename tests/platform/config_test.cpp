// Configuration files: reading, listing, rewriting.
#include "vorn/config.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

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
    int result;
    const char* entries;
    const char* log;  // what follows the file's path
  } cases[] = {
      {"[p]\na=1\n \tb c =  two words \t\n", 2, "a=1;b c=two words;", ""},
      {"\xEF\xBB\xBF[p]\r\nkey = v\r\n", 1, "key=v;", ""},
      {"[o]\na=1\n[ p ]\n# c = 1\n ;x\n\na = b = c\nempty =\n[q]\na=2", 2, "a=b = c;empty=;", ""},
      {"[p]", 0, "", ""},
      {"[p]\nn = \xC3\xA4\xFF", 1, "n=\xC3\xA4\xFF;", ""},
      {"[o]\nbroken\n[p]\na=1\n[q]\n[broken\n", 1, "a=1;", ""},  // faults of others don't matter
      {"", -1, "", ""},
      {"a = 1\n[o]\n", -1, "", ""},
      {"[o]\n[p\na = 1\n", -1, "",
       ":2: malformed line: a section header is [name] and nothing behind it; correct the line"},
      {"[p]\na=1\nnonsense\n", -1, "",
       ":3: malformed line: it is no [section], key = value or # comment; correct the line"},
      {"[p]\n= v\n", -1, "",
       ":2: malformed line: a key is not empty and has no control character; correct the line"},
      {"[p]\na=1\n[q]\n[p]\n", -1, "",
       ":4: malformed line: a section of this name stands above already; correct the line"},
      {"[p]\na=1\nb=2\n a =3\n", -1, "",
       ":4: malformed line: this key stands in the section twice; correct the line"},
      {"[p]\n[] \n", -1, "",
       ":2: malformed line: a section name is not empty and has no bracket or control character; "
       "correct the line"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.text);
    write_file(file, c.text);
    const support::Hash owner = support::make_hash();
    VLIBCSzHash* hash = owner.get();
    EXPECT_EQ(VLIBCFileGetSection(file.c_str(), "p", &hash), c.result);
    EXPECT_EQ(entries(*hash), c.entries);
    EXPECT_EQ(support::syslog_text(), *c.log == '\0' ? "" : file + c.log);
  }
}

TEST_F(Config, RefusesWhatItCannotRead) {
  std::filesystem::create_directory(folder.path("dir"));
  ASSERT_EQ(mkfifo(folder.path("pipe").c_str(), 0600), 0);
  write_file(folder.path("zero"), std::string("[p]\na=\0b\n", 9));
  write_file(folder.path("huge"), "[p]\n" + std::string(17U << 20U, '#'));
  for (const std::string name : {"absent", "dir", "pipe", "zero", "huge"}) {
    SCOPED_TRACE(name);
    const support::Hash owner = support::make_hash({{"old", "1"}});
    VLIBCSzHash* hash = owner.get();
    EXPECT_EQ(VLIBCFileGetSection(folder.path(name).c_str(), "p", &hash), -1);
    EXPECT_EQ(entries(*hash), "old=1;");
    const std::vector<std::string> lines = support::syslog_lines();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_NE(lines[0].find(folder.path(name)), std::string::npos) << lines[0];
  }
}

TEST_F(Config, ListsSectionsInFileOrder) {
  write_file(file, "# [no]\n[z]\na=[x]\n[ a b ]\n[broken\n[z2]");
  const support::List owner = support::make_list();
  VLIBCSzList* list = owner.get();
  EXPECT_EQ(VLIBCFileEnumSection(file.c_str(), &list), 3);
  EXPECT_EQ(support::texts(owner), (std::vector<std::string>{"z", "a b", "z2"}));
  EXPECT_EQ(support::syslog_lines().size(), 1U);
  EXPECT_EQ(VLIBCFileEnumSection(folder.path("absent").c_str(), &list), -1);
}

TEST_F(Config, RewritesOneSectionAndKeepsEveryOtherByte) {
  using Pairs = std::vector<std::pair<std::string, std::string>>;
  const struct {
    const char* before;
    Pairs entries;
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
  for (const auto& c : cases) {
    SCOPED_TRACE(c.before);
    write_file(file, c.before);
    ASSERT_EQ(VLIBCFileSetSection(file.c_str(), "p", nullptr, support::make_hash(c.entries).get(),
                                  kFormat),
              0);
    EXPECT_EQ(read_file(file), c.after);
  }
}

TEST_F(Config, RewritingKeepsOwnerModeAndLink) {
  write_file(file, "[p]\na=1\n");
  ASSERT_EQ(chmod(file.c_str(), 0640), 0);
  const uid_t owner = geteuid() == 0 ? 1234 : geteuid();
  ASSERT_EQ(chown(file.c_str(), owner, getegid()), 0);
  const std::string link = folder.path("link.conf");
  std::filesystem::create_symlink("test.conf", link);
  ASSERT_EQ(VLIBCFileSetSection(link.c_str(), "p", nullptr, support::make_hash().get(), kFormat),
            0);
  struct stat status {};
  ASSERT_EQ(lstat(file.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode, static_cast<mode_t>(S_IFREG | 0640));
  EXPECT_EQ(status.st_uid, owner);
  EXPECT_TRUE(std::filesystem::is_symlink(link));
  EXPECT_EQ(read_file(file), "[p]\n");
}

TEST_F(Config, RewritingRefusesWhatWouldNotReadBack) {
  const std::string text = "[p]\na=1\n[twice]\nb=1\nb=2\n";
  write_file(file, text);
  const struct {
    const char* section;
    const char* key;
    const char* value;
    const char* format;
    int code;
  } cases[] = {
      {"p", "a", "1\nb = 2", kFormat, VLIBC_ERR_BAD_PARAMETER},
      {"p", "a", "1\r", kFormat, VLIBC_ERR_BAD_PARAMETER},
      {"p", "a", " 1", kFormat, VLIBC_ERR_BAD_PARAMETER},
      {"p", "a=b", "1", kFormat, VLIBC_ERR_BAD_PARAMETER},
      {"p", "#a", "1", kFormat, VLIBC_ERR_BAD_PARAMETER},
      {"p", "[a]", "1", kFormat, VLIBC_ERR_BAD_PARAMETER},
      {"p", "", "1", kFormat, VLIBC_ERR_BAD_PARAMETER},
      {"p", "a", "1", "%s = %s", VLIBC_ERR_BAD_PARAMETER},
      {"p", "a", "1", "%s = %s %n\n", VLIBC_ERR_BAD_PARAMETER},
      {"p", "a", "1", "%s\n", VLIBC_ERR_BAD_PARAMETER},
      {"none", "a", "1", kFormat, VLIBC_ERR_NO_SECTION},
      {"twice", "a", "1", kFormat, VLIBC_ERR_MALFORMED_FILE},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.section) + " " + c.key + " " + c.value + " " + c.format);
    const support::Hash hash = support::make_hash({{c.key, c.value}});
    EXPECT_EQ(VLIBCFileSetSection(file.c_str(), c.section, nullptr, hash.get(), c.format), -1);
    EXPECT_EQ(VLIBCErrGet(), c.code);
    EXPECT_EQ(support::syslog_lines().size(), 1U);
    EXPECT_EQ(read_file(file), text);
  }
}

TEST_F(Config, TwoWritersLoseNothing) {
  constexpr int kRounds = 50;
  write_file(file, "[left]\nn = 0\n# between\n[right]\nn = 0\n");
  const auto write_rounds = [this](const char* section) {
    for (int i = 1; i <= kRounds; ++i) {
      const support::Hash hash = support::make_hash({{"n", std::to_string(i)}});
      if (VLIBCFileSetSection(file.c_str(), section, nullptr, hash.get(), kFormat) != 0) {
        return 1;
      }
    }
    return 0;
  };
  const pid_t child = support::fork_child([&] { return write_rounds("left"); });
  EXPECT_EQ(write_rounds("right"), 0);
  EXPECT_EQ(support::wait_child(child), 0);
  EXPECT_EQ(read_file(file), "[left]\n\tn = 50\n# between\n[right]\n\tn = 50\n");
  std::size_t names = 0;
  for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator(folder.path())) {
    ++names;
  }
  EXPECT_EQ(names, 2U);  // the file and its lock, nothing temporary
}

TEST_F(Config, GivesUpOnABusyOrPlantedLock) {
  write_file(file, "[p]\na=1\n");
  const std::string lock = folder.path(".test.conf.lock");
  const support::Hash hash = support::make_hash();
  const int fd = open(lock.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  ASSERT_EQ(flock(fd, LOCK_EX), 0);
  EXPECT_EQ(host::set_section(file.c_str(), "p", *hash, kFormat, std::chrono::milliseconds(50)),
            -1);
  EXPECT_EQ(VLIBCErrGet(), VLIBC_ERR_LOCK_BUSY);
  close(fd);
  EXPECT_EQ(host::set_section(file.c_str(), "p", *hash, kFormat, std::chrono::milliseconds(0)), 0);

  write_file(file, "[p]\na=1\n");
  unlink(lock.c_str());
  std::filesystem::create_symlink(folder.path("victim"), lock);
  EXPECT_EQ(VLIBCFileSetSection(file.c_str(), "p", nullptr, hash.get(), kFormat), -1);
  EXPECT_FALSE(support::exists(folder.path("victim")));
  EXPECT_EQ(read_file(file), "[p]\na=1\n");
}
