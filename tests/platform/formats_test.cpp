// Texts for the page and the CSV files, against names that others choose.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <ctime>

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

// What `format` writes into a buffer of `size`, or "refused".
template <typename Format>
std::string written(Format format, const char* text, std::size_t size = 512) {
  std::string out(size, 'x');
  const int length = format(text, out.data(), size);
  out.resize(std::strlen(out.c_str()));
  EXPECT_EQ(std::max(length, 0), static_cast<int>(out.size()));
  return length < 0 ? "refused" : out;
}

template <char quote>
int escape(const char* text, char* out, size_t size) {
  return VornQazEscChar(text, out, size, quote);
}

TEST(EscChar, MakesEveryTextHarmless) {
  const TextCase cases[] = {
      {"it's \"x\" a\\ a\\'b", "it\\'s \"x\" a\\\\ a\\\\\\'b"},
      {"1\n2\r3\t4\x01\x1b[0m\x7f", "1\\n2\\r3\\t4\\u0001\\u001b[0m\\u007f"},
      {"</script><!--", "\\u003c/script>\\u003c!--"},
      {"\xe2\x80\xa8.\xe2\x80\xa9.\xe2\x80\xaegpj\xc2\x85", "\\u2028.\\u2029.\\u202egpj\\u0085"},
      {"\xc3\xa4\xe2\x82\xac\xf0\x9f\x98\x80", "\xc3\xa4\xe2\x82\xac\xf0\x9f\x98\x80"},
      {"caf\xe9", "caf\\udce9"},
      {"\xc0\xbc", "\\udcc0\\udcbc"},                         // '<', overlong
      {"\xf4\x90\x80\x80", "\\udcf4\\udc90\\udc80\\udc80"}};  // above U+10FFFF
  for (const auto& [text, expected] : cases) {
    EXPECT_EQ(expected, written(escape<'\''>, text));
  }
  EXPECT_EQ("\\u006eo\\n", written(escape<'n'>, "no\n")) << "or it would mean something else";
}

std::string times(int count, std::string_view text) {
  std::string all;
  for (int i = 0; i < count; ++i) {
    all += text;
  }
  return all;
}

// Cut neither inside a character nor inside an escape. By the digits, the beginning of a SHA-256,
// long texts that begin alike stay two.
TEST(LongTexts, EndInAMarkAndADigest) {
  const struct {
    int (*format)(const char* text, char* out, size_t size);
    std::string text;
    std::string expected;  // in 64 bytes
  } cases[] = {
      {escape<'\''>, times(40, "\x01"), times(7, "\\u0001") + "…2432dbb70926df29"},
      {escape<'\''>, times(39, "\x01") + "\x02", times(7, "\\u0001") + "…2b64da86d48a7c50"},
      {escape<'\''>, "x" + times(40, "ä"), "x" + times(21, "ä") + "…95425ebe9e7a5591"},
      {escape<'\''>, times(40, "\xff"), times(7, "\\udcff") + "…6ecd0f0bd7cf53c5"},
      {VornQazFormatCsvString, times(40, "\""), times(22, "\"\"") + "…78e7eb4ddae6058e"},
      {VornQazFormatCsvString, "=" + times(40, "ä"), "'=" + times(21, "ä") + "…7ea977665d669527"}};
  for (const auto& [format, text, expected] : cases) {
    EXPECT_EQ(expected, written(format, text.c_str(), 64));
  }
  EXPECT_EQ("…2432dbb70926df29", written(escape<'\''>, times(40, "\x01").c_str(), 20));
  EXPECT_EQ("refused", written(escape<'\''>, times(40, "\x01").c_str(), 19));
}

TEST(FormatCsvString, KeepsTheFieldAndRunsNoFormula) {
  const TextCase cases[] = {{"say \"x\", text", "say \"\"x\"\", text"},
                            {"a\nb\rc\td\ve\ff", "a b c d e f"},
                            {" \r\n-x", "'   -x"},
                            {"\"=1", "\"\"=1"}};
  for (const auto& [text, expected] : cases) {
    EXPECT_EQ(expected, written(VornQazFormatCsvString, text));
  }
  for (const std::string text :
       {"=cmd|' /C calc'!A0", "+1+1", "-2+3", "@SUM(A1)", "-", "\xef\xbc\x9d 1" /* full width */}) {
    EXPECT_EQ("'" + text, written(VornQazFormatCsvString, text.c_str()));
  }
  for (const char* text : {"-12.5", "a=1", "caf\xe9"}) {
    EXPECT_EQ(text, written(VornQazFormatCsvString, text));
  }
}

TEST(TimeConvert, GivesLocalTimeOrFails) {
  EXPECT_TRUE(support::passes_in_zone("AAA-5:30", [] {
    EXPECT_EQ("2024-02-29 17:30:00", written(VornQazTimeConvert, "1709208000", 20));
    EXPECT_EQ("2106-02-07 11:58:15", written(VornQazTimeConvert, "4294967295"));
    EXPECT_EQ("1969-12-31 23:59:59", written(VornQazTimeConvert, "-19801"));
  }));
  for (const char* text :
       {"", "12x", " 12", "1.5", "99999999999999999999", "9223372036854775807", "300000000000"}) {
    EXPECT_EQ("refused", written(VornQazTimeConvert, text)) << text;
  }
  EXPECT_EQ("refused", written(VornQazTimeConvert, "0", 19));
}

TEST(CsvFile, GetsOneMarkIfItIsARegularFile) {
  const support::TempFolder folder;
  const std::string path = folder.path("x.csv");
  const std::string content(200'000, 'x');
  write_file(path, content);
  ASSERT_EQ(0, chmod(path.c_str(), 0640));
  for (int round = 0; round < 2; ++round) {
    EXPECT_EQ(0, VornQazCsvFile(path.c_str()));
    EXPECT_EQ("\xEF\xBB\xBF" + content, read_file(path));
  }
  EXPECT_EQ(0640U, support::status_of(path).st_mode & 0777U)
      << "readers of the report must not lose the CSV";
  write_file(folder.path("elsewhere"), "keep");
  ASSERT_EQ(0, symlink(folder.path("elsewhere").c_str(), folder.path("link").c_str()));
  ASSERT_EQ(0, mkfifo(folder.path("pipe").c_str(), 0600));
  for (const char* name : {"absent", "link", "pipe", ""}) {
    EXPECT_EQ(-1, VornQazCsvFile(folder.path(name).c_str())) << name;
  }
  EXPECT_EQ("keep", read_file(folder.path("elsewhere")));
}

TEST(Language, IsAPlainCodeOrEnglish) {
  const TextCase cases[] = {{"", "en"},    {"zh-Hant", "zh-Hant"}, {"zh-Hant1", "en"},
                            {"a;b", "en"}, {"-x", "en"},           {"en\n", "en"}};
  char code[8];
  for (const auto& [language, expected] : cases) {
    EXPECT_EQ(0, VornQazImportLang(make_hash({{"language", language}}).get(), code, sizeof code));
    EXPECT_STREQ(expected, code);
  }
}

}  // namespace
