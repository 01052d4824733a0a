#include "run/page.hpp"

#include <fcntl.h>
#include <strings.h>
#include <sys/stat.h>

#include <cstdio>
#include <cstdlib>
#include <deque>
#include <memory>
#include <string>
#include <string_view>

#include "report_format/reports.hpp"
#include "vorn/base/file_io.hpp"

namespace host {
namespace {

// What begins a line of each part. Names in the data can't: they hold no raw line end and no '<'.
std::deque<std::string> parts_of(std::string_view report_list) {
  std::deque<std::string> parts{
      "<!DOCTYPE html>",    "<template id=\"data\">",
      "var vornLang = '",   std::string("var ") + report_format::kFactsVariable + " = {",
      "</template>",        "<body ",
      "<main id=\"report\""};
  for (const report_format::ReportFormat* report : report_format::kReports) {
    if (report_format::is_selected(report->name, report_list)) {
      parts.push_back(std::string("<section data-report=\"") + report->name + "\">");
      parts.emplace_back("</section>");
    }
  }
  parts.insert(parts.end(), {"</main>", "<script>", "</html>"});
  return parts;
}

// The lines of a file, of any length.
class Lines {
 public:
  explicit Lines(Fd fd) : file_(fd ? fdopen(fd.get(), "r") : nullptr) {
    if (file_) {
      fd.release();
    }
  }
  ~Lines() { std::free(line_); }  // NOLINT(cppcoreguidelines-no-malloc): getline's
  Lines(const Lines&) = delete;
  Lines& operator=(const Lines&) = delete;

  // False at the end of the file, and when it can't be read on.
  bool next(std::string_view& line) {
    const ssize_t length = file_ ? getline(&line_, &size_, file_.get()) : -1;
    line = length < 0 ? std::string_view() : std::string_view(line_, static_cast<size_t>(length));
    return length >= 0;
  }

 private:
  struct Close {
    void operator()(FILE* file) const { std::fclose(file); }
  };
  std::unique_ptr<FILE, Close> file_;
  char* line_ = nullptr;
  std::size_t size_ = 0;
};

}  // namespace

bool page_is_whole(const char* path, std::string_view report_list) {
  const ErrnoKeeper keeper;
  std::deque<std::string> parts = parts_of(report_list);
  Lines lines(open_regular(AT_FDCWD, path));
  for (std::string_view line; lines.next(line);) {
    if (parts.empty()) {
      return false;  // something follows the end
    }
    if (line.starts_with(parts.front())) {
      parts.pop_front();
    }
  }
  return parts.empty();
}

bool page_is_complete(const char* path) {
  return page_is_complete_at(AT_FDCWD, path);
}

bool page_is_complete_at(int folder, const char* name) {
  constexpr std::string_view kBeginning = "<!DOCTYPE html>";
  constexpr std::string_view kLastLine = "\n</html>";
  const ErrnoKeeper keeper;
  const Fd fd = open_regular(folder, name);
  struct stat status {};
  if (!fd || fstat(fd.get(), &status) != 0) {
    return false;
  }
  char buffer[kBeginning.size()];
  if (pread(fd.get(), buffer, sizeof buffer, 0) != static_cast<ssize_t>(sizeof buffer) ||
      strncasecmp(buffer, kBeginning.data(), kBeginning.size()) != 0) {
    return false;
  }
  const ssize_t got =
      pread(fd.get(), buffer, sizeof buffer, status.st_size - static_cast<off_t>(sizeof buffer));
  if (got <= 0) {
    return false;
  }
  std::string_view tail(buffer, static_cast<std::size_t>(got));
  if (tail.back() == '\n') {
    tail.remove_suffix(1);
  }
  return tail.ends_with(kLastLine);
}

}  // namespace host
