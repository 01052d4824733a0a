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

}  // namespace
}  // namespace vornreport
