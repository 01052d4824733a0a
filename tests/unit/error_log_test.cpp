#include "vornreport/error_log.hpp"

#include <cstring>

#include "fixture.hpp"

namespace vornreport {
namespace {

using ErrorLogTest = UnitTest;

struct Form {
  bool nested;
  int error;
  const char* syslog;
  const char* output;
};

TEST_F(ErrorLogTest, WritesBothChannelsInEachForm) {
  const Form forms[] = {
      {false, 0, "src/x:7 lost a&b\n", "(src/x:7)lost a&b\n"},
      {false, ENOENT, "src/x:7 (No such file or directory)lost a&b\n",
       "(src/x:7)(No such file or directory)lost a&b\n"},
      {true, 0, "src/x:7 (src/x:7)(Success)lost a&b\n\n",
       "(src/x:7)(src/x:7)(Success)lost a&b\n\n"},
      {true, EACCES, "src/x:7 (Permission denied)(src/x:7)(Permission denied)lost a&b\n\n",
       "(src/x:7)(Permission denied)(src/x:7)(Permission denied)lost a&b\n\n"},
  };
  for (const Form& form : forms) {
    const std::string output = printed([&] {
      errno = form.error;
      form.nested ? REPORT_LOG_ERR_NESTED("src/x", 7, "lost %s", "a&b")
                  : REPORT_LOG_ERR("src/x", 7, "lost %s\n", "a&b");
      EXPECT_EQ(errno, form.error);
    });
    EXPECT_EQ(output, form.output);
    EXPECT_EQ(support::syslog_text(), form.syslog);
  }
}

TEST_F(ErrorLogTest, KeepsLongAndPercentTextsWhole) {
  const std::string name = "100%m %s%n" + std::string(20000, 'x');
  const std::string output = printed([&] { REPORT_LOG_ERR("src/x", 1, "[%s]\n", name.c_str()); });
  EXPECT_EQ(output, "(src/x:1)[" + name + "]\n");
  EXPECT_EQ(support::syslog_text(), "src/x:1 [" + name + "]\n");
}

TEST_F(ErrorLogTest, NamesForgeNoLines) {
  const struct {
    const char* name;
    const char* shown;
  } cases[] = {{"a\n(src/x:1)get link=b", "a\\x0a(src/x:1)get link=b"},
               {"\x1b[2J\x7f\t", "\\x1b[2J\\x7f\\x09"},
               {"\xc2\x9b"
                "31m\xc2\xa0",
                "\\xc2\\x9b"
                "31m\xc2\xa0"},
               {"gr\xc3\xbc\xc3\x9f \xff\xc2", "gr\xc3\xbc\xc3\x9f \xff\xc2"},
               {nullptr, "(null)"}};
  for (const auto& [name, shown] : cases) {
    const std::string whole = std::string("[") + shown + "]\n";
    EXPECT_EQ(printed([&, text = name] { report_trace("src/x", 1, "[%s]\n", text); }),
              "(src/x:1)" + whole);
    errno = 0;
    printed([&, text = name] { REPORT_LOG_ERR("src/x", 1, "[%s]\n", text); });
    EXPECT_EQ(support::syslog_text(), "src/x:1 " + whole);
  }
  EXPECT_EQ(printed([] {
              report_trace("src/x", 1, "%d %u %llu %lld 0x%04X %f %.1f%% %s\n", -1, 4000000000U,
                           18446744073709551615ULL, -5LL, 0xD00U, -0.5, 2.25, "end");
            }),
            "(src/x:1)-1 4000000000 18446744073709551615 -5 0x0D00 -0.500000 2.2% end\n");
}

}  // namespace
}  // namespace vornreport
