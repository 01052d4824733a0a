// Texts for the page and the CSV files, against names that others choose.
#include "formats.hpp"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdlib>
#include <cstring>
#include <ctime>
#include <set>

#include "support.hpp"
#include "vorn/report.h"

using support::make_hash;
using support::read_file;
using support::write_file;

namespace {

struct TextCase {
  const char* text;
  const char* expected;
};

std::string escaped(const char* text, char quote = '\'') {
  char out[512];
  const int length = VornQazEscChar(text, out, sizeof out, quote);
  EXPECT_EQ(static_cast<int>(std::strlen(out)), length);
  return out;
}

TEST(EscChar, MakesEveryTextHarmless) {
  const TextCase cases[] = {
      {"", ""},
      {"/srv/a b.txt", "/srv/a b.txt"},
      {"it's \"x\"", "it\\'s \"x\""},
      {"a\\", "a\\\\"},
      {"a\\'b", "a\\\\\\'b"},
      {"1\n2\r3\t4", "1\\n2\\r3\\t4"},
      {"</script><!--", "\\u003c/script>\\u003c!--"},
      {"\x01\x1b[0m\x7f", "\\u0001\\u001b[0m\\u007f"},
      {"a\xe2\x80\xa8"
       "b\xe2\x80\xa9",
       "a\\u2028b\\u2029"},
      {"exe.\xe2\x80\xaegpj", "exe.\\u202egpj"},
      {"\xc2\x85", "\\u0085"},
      {"\xc3\xa4\xe2\x82\xac\xf0\x9f\x98\x80", "\xc3\xa4\xe2\x82\xac\xf0\x9f\x98\x80"},
      {"caf\xe9", "caf\\udce9"},
      {"\xe2\x82", "\\udce2\\udc82"},                        // cut short
      {"\xc0\xbc", "\\udcc0\\udcbc"},                        // '<', overlong
      {"\xed\xa0\x80", "\\udced\\udca0\\udc80"},             // surrogate
      {"\xf4\x90\x80\x80", "\\udcf4\\udc90\\udc80\\udc80"},  // above U+10FFFF
  };
  for (const auto& [text, expected] : cases) {
    EXPECT_EQ(expected, escaped(text));
  }
  EXPECT_EQ("it's \\\"x\\\"", escaped("it's \"x\"", '"'));
  EXPECT_EQ("\\u006eo\\n", escaped("no\n", 'n')) << "an escaped letter would mean something else";
}

TEST(EscChar, FailsOnlyWhenTheBufferIsTooSmall) {
  char out[8] = "before";
  EXPECT_EQ(7, VornQazEscChar("\x01x", out, sizeof out, '\''));
  EXPECT_EQ(-1, VornQazEscChar("\x01xy", out, sizeof out, '\''));
  EXPECT_STREQ("", out);
  EXPECT_EQ(-1, VornQazEscChar(nullptr, out, sizeof out, '\''));
}

TEST(FormatCsvString, KeepsTheFieldAndRunsNoFormula) {
  const TextCase cases[] = {
      {"plain, text", "plain, text"},
      {"say \"x\"", "say \"\"x\"\""},
      {"a\nb\rc\td\ve\ff", "a b c d e f"},
      {"=cmd|' /C calc'!A0", "'=cmd|' /C calc'!A0"},
      {"+1+1", "'+1+1"},
      {"-2+3", "'-2+3"},
      {"@SUM(A1)", "'@SUM(A1)"},
      {"\t=1", "' =1"},
      {" \r\n-x", "'   -x"},
      {"\"=1", "\"\"=1"},
      {"\xef\xbc\x9d"
       "1+1",
       "'\xef\xbc\x9d"
       "1+1"},  // full-width equals sign
      {"-12.5", "-12.5"},
      {"-", "'-"},
      {"a=1", "a=1"},
      {"caf\xe9", "caf\xe9"},
  };
  for (const auto& [text, expected] : cases) {
    char out[128];
    EXPECT_EQ(static_cast<int>(std::strlen(expected)),
              VornQazFormatCsvString(text, out, sizeof out));
    EXPECT_STREQ(expected, out);
  }
  char small[4];
  EXPECT_EQ(-1, VornQazFormatCsvString("\"\"", small, sizeof small));
  EXPECT_STREQ("", small);
}

TEST(TimeConvert, GivesLocalTimeOrFails) {
  setenv("TZ", "XXX-5:30", 1);
  tzset();
  const TextCase cases[] = {
      {"0", "1970-01-01 05:30:00"},
      {"1709208000", "2024-02-29 17:30:00"},
      {"4294967295", "2106-02-07 11:58:15"},
      {"-19801", "1969-12-31 23:59:59"},
      {"", ""},
      {"abc", ""},
      {"12x", ""},
      {" 12", ""},
      {"1.5", ""},
      {"99999999999999999999", ""},
      {"9223372036854775807", ""},
      {"300000000000", ""},
  };
  for (const auto& [text, expected] : cases) {
    char out[128] = "before";
    const int length = VornQazTimeConvert(text, out, sizeof out);
    EXPECT_EQ(*expected == '\0' ? -1 : 19, length) << text;
    EXPECT_STREQ(expected, out) << text;
  }
  unsetenv("TZ");
  tzset();
  char small[19];
  EXPECT_EQ(-1, VornQazTimeConvert("0", small, sizeof small));
}

TEST(CsvFile, GetsOneMarkAndKeepsTheRest) {
  const support::TempFolder folder;
  const std::string big(200'000, 'x');
  for (const std::string& content : {std::string(), std::string("a\tb\n"), big}) {
    const std::string path = folder.path("x.csv");
    write_file(path, content);
    ASSERT_EQ(0, chmod(path.c_str(), 0640));
    for (int round = 0; round < 2; ++round) {
      EXPECT_EQ(0, VornQazCsvFile(path.c_str()));
      EXPECT_EQ("\xEF\xBB\xBF" + content, read_file(path));
    }
    struct stat status {};
    EXPECT_EQ(0, stat(path.c_str(), &status));
    EXPECT_EQ(0640U, status.st_mode & 0777U) << "readers of the report must not lose the CSV";
  }
}

TEST(CsvFile, TouchesNothingButARegularFile) {
  const support::TempFolder folder;
  write_file(folder.path("elsewhere"), "keep");
  ASSERT_EQ(0, symlink(folder.path("elsewhere").c_str(), folder.path("link").c_str()));
  ASSERT_EQ(0, mkfifo(folder.path("pipe").c_str(), 0600));
  for (const char* name : {"absent", "link", "pipe", ""}) {
    EXPECT_EQ(-1, VornQazCsvFile(folder.path(name).c_str())) << name;
    EXPECT_NE("", support::syslog_text()) << name;
  }
  EXPECT_EQ("keep", read_file(folder.path("elsewhere")));
}

TEST(SharePaths, AreOneBlockSortedAndQuoted) {
  const support::Hash hash =
      make_hash({{"photos", "/srv/photos"}, {"__proto__", "/srv/</script>"}, {"b'\n", "/x\\"}});
  const char* expected =
      "<script type='text/javascript'>\nvar vornSharePath = {\n"
      "['__proto__'] : '/srv/\\u003c/script>',\n"
      "['b\\'\\n'] : '/x\\\\',\n"
      "['photos'] : '/srv/photos'\n};\n</script>\n";
  EXPECT_EQ(expected, host::share_path_block(*hash));

  const support::TempFolder folder;
  FILE* data = std::fopen(folder.path("data").c_str(), "a");
  ASSERT_NE(nullptr, data);
  EXPECT_EQ(0, VornQazImportSharePathHash(hash.get(), data));
  EXPECT_EQ(expected, read_file(folder.path("data"))) << "it must be flushed";
  EXPECT_EQ(0, VornQazImportSharePathHash(hash.get(), data));
  std::fclose(data);
  EXPECT_EQ(expected, read_file(folder.path("data"))) << "once in the life of the process";
}

TEST(FileTypes, IgnoreCaseAndHoldNoExtensionTwice) {
  support::Hash hash = make_hash();
  VLIBCSzHash* filled = hash.get();
  const int count = VornQazInitFileTypeHash(&filled);
  EXPECT_EQ(static_cast<int>(hash->sorted().size()), count);
  const TextCase cases[] = {{"jpg", "image"},  {"JPG", "image"},       {"Docx", "document"},
                            {"gz", "archive"}, {"mkv", "video"},       {"sqlite", "database"},
                            {"flac", "audio"}, {"vmdk", "disk_image"}, {"tmp", "temporary"}};
  for (const auto& [extension, label] : cases) {
    const char* found = VLIBCSzHashGetValue(hash.get(), extension);
    EXPECT_EQ(std::string("reportUI_file_type_") + label, found == nullptr ? "" : found);
  }
  EXPECT_EQ(nullptr, VLIBCSzHashGetValue(hash.get(), ""));
  EXPECT_EQ(nullptr, VLIBCSzHashGetValue(hash.get(), "nosuchthing"));
}

TEST(Language, IsAPlainCode) {
  const TextCase cases[] = {
      {nullptr, "en"},  {"", "en"},   {"de", "de"}, {"pt-BR", "pt-BR"}, {"zh-Hant", "zh-Hant"},
      {"zh-Hant1", ""}, {"../x", ""}, {"a;b", ""},  {"-x", ""},         {"d e", ""}};
  for (const auto& [language, expected] : cases) {
    const support::Hash hash =
        language == nullptr ? make_hash() : make_hash({{"language", language}});
    char code[8] = "before";
    EXPECT_EQ(*expected == '\0' ? -1 : 0, VornQazImportLang(hash.get(), code, sizeof code));
    EXPECT_STREQ(expected, code);
    EXPECT_EQ(*expected == '\0' ? 1U : 0U, support::syslog_lines().size());
  }
}

}  // namespace
