// What leads to the fleet's engine, and how texts get there and back.
#include "report_format/fleet.hpp"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <fstream>

#include "fleet/fleet_conf.hpp"
#include "support.hpp"

namespace {

using Entries = std::vector<std::pair<std::string, std::string>>;

TEST(FleetConf, RefusesWhatLeadsNowhereOrTellsSecrets) {
  const std::string secret = "/tmp/fleet-secret";
  std::ofstream(secret) << "word\n";
  chmod(secret.c_str(), 0600);
  const std::string open_to_all = "/tmp/fleet-open";
  std::ofstream(open_to_all) << "word\n";
  chmod(open_to_all.c_str(), 0644);
  struct Case {
    Entries entries;
    const char* problem;  // a part of it; empty: none
  };
  const std::pair<std::string, std::string> url{"url", "http://127.0.0.1:8123/"};
  for (const Case& one :
       std::vector<Case>{{{url}, ""},
                         {{{"url", "http://one:8123, https://two/"}, {"database", "d_1"}}, ""},
                         {{url, {"user", "u"}, {"password_file", secret}}, ""},
                         {{}, "url is missing"},
                         {{{"url", "http://user:pw@host/"}}, "holds credentials"},
                         {{{"url", "http://user@host/"}}, "holds credentials"},
                         {{{"url", "ftp://host/"}}, "neither http"},
                         {{{"url", "file:///etc/passwd"}}, "neither http"},
                         {{{"url", "http://host/?database=x"}}, "holds '?'"},
                         {{url, {"database", "d; drop table x"}}, "no name of letters"},
                         {{url, {"cluster", "c'"}}, "no name of letters"},
                         {{url, {"server", "a:b"}}, "colon"},
                         {{url, {"server", "a\nb"}}, "control character"},
                         {{url, {"server", "</script>"}}, "quote, backslash"},
                         {{url, {"server", "=1+1"}}, "formula"},
                         {{url, {"password_file", secret}}, "no user"},
                         {{url, {"user", "a:b"}}, "colon"},
                         {{url, {"user", "u"}, {"password_file", "secret"}}, "not absolute"},
                         {{url, {"user", "u"}, {"password_file", open_to_all}}, "by others"},
                         {{url, {"user", "u"}, {"password_file", "/tmp"}}, "can't be read"},
                         {{url, {"sever", "x"}}, "key sever is unknown"}}) {
    const host::FleetReading reading = host::fleet_conf_of(one.entries);
    const bool is_fine = *one.problem == '\0';
    EXPECT_EQ(reading.conf.has_value(), is_fine) << reading.problem;
    EXPECT_NE(reading.problem.find(one.problem), std::string::npos)
        << reading.problem << " for " << one.problem;
    EXPECT_EQ(reading.problem.find("pw"), std::string::npos) << reading.problem;
  }
}

TEST(FleetText, RowsAndPartitionsComeBackAsTheyWere) {
  const std::vector<std::string> texts{
      "",    "plain",  "it's", "back\\slash", std::string("tab\tline\nreturn\r\b\f"),
      "\\N", "'), (1", "\xff", "\\",          "\u00fc"};
  std::string row;
  for (const std::string& text : texts) {
    row += row.empty() && &text == &texts.front() ? "" : "\t";
    report_format::append_fleet_text(row, text);
    report_format::FleetPartition partition;
    ASSERT_TRUE(report_format::read_partition(
        "(" + report_format::fleet_literal(text) + ",'daily',17)", partition))
        << text;
    EXPECT_EQ(partition.server, text);
    EXPECT_EQ(partition.run, 17U);
  }
  EXPECT_EQ(row.find('\n'), std::string::npos);
  row += "\t\\N";
  std::vector<char*> fields;
  report_format::split_fleet_row(row, fields);
  ASSERT_EQ(fields.size(), texts.size() + 1);
  for (size_t i = 0; i < texts.size(); ++i) {
    EXPECT_EQ(fields[i], texts[i]);
  }
  EXPECT_EQ(fields.back(), nullptr);
  report_format::FleetPartition partition;
  for (const char* wrong : {"", "all", "('a','b')", "('a','b',1", "('a','b',x)", "('a'"}) {
    EXPECT_FALSE(report_format::read_partition(wrong, partition)) << wrong;
  }
}

}  // namespace
