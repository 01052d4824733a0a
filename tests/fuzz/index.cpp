// File indexes: databases that others write. A copy, if one is made, must be what the program can
// take over without a single failure.
#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cstdlib>

#include "fuzz.hpp"
#include "machine/index_copy.hpp"
#include "vorn/base/file_io.hpp"

namespace {

struct Rows {
  int bad = 0;
};

int check_row(void* context, int /*columns*/, char** values, char** /*names*/) {
  constexpr int kOwner = 0;
  constexpr int kPath = 3;
  const std::string path = values[kPath] != nullptr ? std::string(values[kPath]) + "/" : "/../";
  const bool is_bad = values[kOwner] == nullptr || path.find("/../") != std::string::npos;
  static_cast<Rows*>(context)->bad += is_bad ? 1 : 0;
  return 0;
}

}  // namespace

void fuzz::one(std::string_view text) {
  static const std::string folder = [] {
    std::string name = "/tmp/fuzz-index-XXXXXX";
    require(mkdtemp(name.data()) != nullptr, "there is a folder for copies");
    return name;
  }();
  const std::string copy = folder + "/index.db";
  unlink(copy.c_str());
  const MemoryFile file(text);
  const host::Fd followed(open(file.path(), O_RDONLY | O_CLOEXEC));
  try {
    host::copy_index(followed.get(), static_cast<off_t>(text.size()), copy);
  } catch (const host::IndexRefusal& refusal) {
    require(!refusal.reason.empty() && !refusal.advice.empty(), "a refusal says why");
    return;
  }
  sqlite3* db = nullptr;
  require(sqlite3_open(copy.c_str(), &db) == SQLITE_OK, "the copy opens");
  Rows rows;
  const int result = sqlite3_exec(
      db,
      "select owner_name, time_modify, size, '/srv/s/'||path, name, file_ext from file_info where "
      "is_dir=0;",
      check_row, &rows, nullptr);
  sqlite3_close(db);
  require(result == SQLITE_OK, "the copy can be read to its end");
  require(rows.bad == 0, "no row leads out of the share, or has no owner");
}
