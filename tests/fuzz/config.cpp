// Configuration files: four lines that say what to change, then the file.
#include "vorn/config.h"

#include <memory>

#include "base/text_containers.hpp"
#include "config/config_edit.hpp"
#include "config/config_lines.hpp"
#include "fuzz.hpp"

namespace {

using Hash = std::unique_ptr<VLIBCSzHash, decltype(&VLIBCSzHashFree)>;

int count_sections(const char* file) {
  auto* names = VLIBCSzListAlloc(8);
  const int count = VLIBCFileEnumSection(file, &names);
  fuzz::require(count == VLIBCSzListCount(names), "sections are counted right");
  VLIBCSzListFree(names);
  return count;
}

Hash section_of(const char* file, const std::string& section) {
  auto* hash = VLIBCSzHashAlloc(8);
  const int keys = VLIBCFileGetSection(file, section.c_str(), &hash);
  Hash found(hash, VLIBCSzHashFree);
  fuzz::require(keys <= static_cast<int>(found->sorted().size()), "keys are counted right");
  return keys < 0 ? Hash(nullptr, VLIBCSzHashFree) : std::move(found);
}

}  // namespace

void fuzz::one(std::string_view text) {
  using enum host::SectionEdit::Kind;
  const std::string kind = take_line(text);
  host::SectionEdit edit{kind == "add"      ? add
                         : kind == "remove" ? remove
                                            : change,
                         take_line(text),
                         {}};
  const std::string key = take_line(text);
  const std::string value = take_line(text);
  edit.entries = {{key, kind == "unset" ? std::nullopt : std::optional(value)}};

  std::string again;
  for (const host::ConfigLine& line : host::parse_lines(text)) {
    again += line.bytes;
  }
  require(again == text, "the lines are the file");

  const MemoryFile before(text);
  const int sections = count_sections(before.path());
  const bool was_there = section_of(before.path(), edit.section) != nullptr;
  const auto changed = host::edited_text("file", text, edit);
  if (!changed) {
    return;
  }
  const MemoryFile after(*changed);
  const Hash found = section_of(after.path(), edit.section);
  require(was_there == (edit.kind != add), "only a section that reads is changed");
  require((found == nullptr) == (edit.kind == remove), "the section is there, or gone");
  require(count_sections(after.path()) - sections == (edit.kind == add      ? 1
                                                      : edit.kind == remove ? -1
                                                                            : 0),
          "no other section appears or goes");
  if (found != nullptr) {
    const char* stored = found->find(key);
    require(kind == "unset" ? stored == nullptr : stored != nullptr && stored == value,
            "the key has its value");
  }
}
