// A report's surroundings: a statistics database, the profile, the data file.
#pragma once

#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "fixture.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_args.hpp"
#include "vornreport/report_data.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {

class ReportTest : public UnitTest {
 protected:
  ReportTest() : data_(report_data_path().c_str()) {
    unlink(data_.c_str());
    set_profile("real_path_stat_db", folder_.path("stat.db"));
    set_profile("real_path_csv", folder_.path());
    users_.reset(VLIBCSzHashAlloc(8));
    shares_.reset(VLIBCSzHashAlloc(8));
    volumes_.reset(VLIBCSzHashAlloc(8));
  }
  ~ReportTest() override { unlink(data_.c_str()); }

  static void set(HashHandle& hash, const std::string& key, const std::string& value) {
    VLIBCSzHash* raw = hash ? hash.release() : VLIBCSzHashAlloc(8);
    VLIBCSzHashSetValue(&raw, key.c_str(), value.c_str());
    hash.reset(raw);
  }
  void set_profile(const std::string& key, const std::string& value) { set(profile_, key, value); }

  void add(const std::string& share, const std::string& name, off_t size) {
    const SqliteHandle db = VORNReportDBInit(profile_.get());
    add(db.get(), share, name, size);
  }
  static void add(sqlite3* db, const std::string& share, const std::string& name, off_t size,
                  uid_t owner = 0, time_t mtime = 0, const char* type = "") {
    struct stat status {};
    status.st_size = size;
    status.st_uid = owner;
    status.st_mtime = mtime;
    const std::string path = std::string("/").append(share).append("/").append(name);
    const std::string last = name.substr(name.rfind('/') + 1);
    const FileInfo info{share.c_str(), path.c_str(), last.c_str(), type, &status};
    ASSERT_EQ(ReportDBAddFile(db, &info), 0);
  }

  int run(ReportFunction report, int embedded = 0) {
    ReportArgs args{"p1",          profile_.get(), users_.get(), volumes_.get(),
                    shares_.get(), nullptr,        nullptr,      embedded};
    int result = 0;
    output_ = printed([&] { result = report(&args); });
    return result;
  }

  // The report in a child: the page's block, then "|" and the CSV file.
  std::string outcome(ReportFunction report, const std::string& csv_name) {
    return in_child([&] {
      data_ = report_data_path().c_str();
      run(report);
      const std::string text = data() + "|" + csv(csv_name);
      unlink(data_.c_str());
      return text;
    });
  }

  std::string data() const { return support::read_file(data_); }
  std::string csv(const std::string& name) const {
    return support::read_file(folder_.path(name + ".csv"));
  }

  std::string data_;
  std::string output_;
  HashHandle profile_;
  HashHandle users_;
  HashHandle volumes_;
  HashHandle shares_;
};

// With the statistics database open.
class StatisticsTest : public ReportTest {
 protected:
  StatisticsTest() : db_(VORNReportDBInit(profile_.get())) {}

  // All rows of a query, columns joined with '|' and rows with a line feed.
  static std::string rows(sqlite3* db, const std::string& sql) {
    std::string text;
    const auto add = [](void* out, int count, char** values, char**) {
      auto& all = *static_cast<std::string*>(out);
      for (int i = 0; i < count; ++i) {
        all += std::string(i == 0 ? "" : "|") + (values[i] != nullptr ? values[i] : "NULL");
      }
      all += "\n";
      return 0;
    };
    EXPECT_EQ(sqlite3_exec(db, sql.c_str(), add, &text, nullptr), SQLITE_OK) << sql;
    return text;
  }
  std::string rows(const std::string& sql) const { return rows(db_.get(), sql); }

  SqliteHandle db_;
  HashHandle types_{VLIBCSzHashAlloc(8)};
};

}  // namespace vornreport
