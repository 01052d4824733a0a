// A finished page, line by line, and the rows of the data blocks in it.
#ifndef VORN_HOST_PAGE_LINES_HPP
#define VORN_HOST_PAGE_LINES_HPP

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vorn/base/file_io.hpp"

namespace host {

// The lines of the first 64 MiB of a page. Names in it are whatever users make of them, so no size
// is trusted.
class PageLines {
 public:
  // No lines when `path` is no regular file (or a link), or can't be read.
  explicit PageLines(const char* path);

  // False at the end. What is longer than 64 KiB is cut: no row that is one could be so long.
  bool next(std::string& line);
  // Whether there may be more of the page than could be read.
  bool limit_is_reached() const;

 private:
  bool fill();

  Fd fd_;
  std::vector<char> buffer_;
  std::size_t read_ = 0;
  std::size_t at_ = 0;
  std::size_t end_ = 0;
};

// The values of the row "[ 'text', 12, '12' ]", whatever brackets and commas follow; nothing for
// what is no such row. Escapes stay as they are: they tell texts apart as well as what they stand
// for.
std::optional<std::vector<std::string>> row_of(std::string_view line);

}  // namespace host

#endif
