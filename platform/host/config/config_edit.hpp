// Changing a configuration file as an administrator would: what isn't meant stays byte for byte.
#ifndef VORN_HOST_CONFIG_EDIT_HPP
#define VORN_HOST_CONFIG_EDIT_HPP

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace host {

struct SectionEdit {
  enum class Kind {
    add,     // a new section at the end of the file
    change,  // a section that is there; keys that aren't named stay
    remove   // header and keys with what stands between them; comments around them stay
  };
  // Keys with their new values; no value removes the key's line. Of two for one key the last
  // counts. An entry keeps its place and indent, a new one follows the section's last key.
  using Entries = std::vector<std::pair<std::string, std::optional<std::string>>>;

  Kind kind = Kind::change;
  std::string section;
  Entries entries;
  std::string new_name{};  // change: the section's from now on; empty when it keeps its own
};

// Applies `edit` to `file`, as rewrite_config does, when the new text reads back as meant: the
// section with exactly its entries, and every other section with those it had.
// 0; -1 with nothing changed and one log line: the section is there already (add, or the new name)
// or isn't (change, remove), it is malformed, a name or value doesn't fit a line, or the file can't
// be replaced.
int edit_section(const char* file, const SectionEdit& edit);

// What `edit` makes of `text`, the content of `file`. Nothing, after one log line, where
// edit_section fails.
std::optional<std::string> edited_text(const char* file, std::string_view text,
                                       const SectionEdit& edit);

}  // namespace host

#endif
