// The line format of vorn/config.h, for reading and for rewriting.
#ifndef VORN_HOST_CONFIG_LINES_HPP
#define VORN_HOST_CONFIG_LINES_HPP

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace host {

enum class LineKind { ignored, header, entry, malformed };

// One line of a file; the views point into the file's text.
struct ConfigLine {
  LineKind kind = LineKind::ignored;
  std::string_view bytes{};          // the whole line with its line end
  std::string_view name{};           // of a section or a key
  std::string_view value{};          // of an entry
  const char* problem = nullptr;     // of a malformed line
  bool looks_like_a_header = false;  // of a malformed line
};

// What is wrong with a line that is well-formed by itself.
inline constexpr const char* kRepeatedSection = "a section of this name stands above already";
inline constexpr const char* kRepeatedKey = "this key stands in the section twice";

ConfigLine parse_line(std::string_view bytes);
std::vector<ConfigLine> parse_lines(std::string_view text);

// Where a section stands among the lines of its file.
struct SectionRange {
  std::size_t header = 0;
  std::size_t end = 0;  // the next header, or behind the last line
};

// The log line of a malformed line; `index` counts from 0.
void log_malformed(const char* file, std::size_t index, const char* problem);

enum class FindResult { found, missing, malformed };

// Finds `section` and checks it, which includes that no key stands twice in it and that the section
// itself doesn't. `file` is for the log line that a malformed section gets.
FindResult find_section(const std::vector<ConfigLine>& lines, const char* file,
                        std::string_view section, SectionRange& range);

}  // namespace host

#endif
