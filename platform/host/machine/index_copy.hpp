// Taking over what a file index lists.
#ifndef VORN_HOST_INDEX_COPY_HPP
#define VORN_HOST_INDEX_COPY_HPP

#include <sys/types.h>

#include <string>

namespace host {

// Thrown for an index that can't be used.
struct IndexRefusal {
  std::string reason;
  std::string advice =
      "have a whole one renamed into its place, or run vornctl share set NAME file_index ''";
};

// Reads the table `file_info` of the open database `source` (`size` bytes) and writes a new
// database at `path`, where nothing may be, with the files of that table: what a hostile database
// has besides doesn't get there, nor does a single row when one of them is bad. Throws an
// IndexRefusal; what it has written by then stays.
void copy_index(int source, off_t size, const std::string& path);

}  // namespace host

#endif
