// A section as the platform's calls take it.
#ifndef VORN_HOST_SECTION_HASH_HPP
#define VORN_HOST_SECTION_HASH_HPP

#include "base/text_containers.hpp"
#include "vorn/admin/configuration.hpp"

namespace admin {

inline VLIBCSzHash hash_of(const Section& section) {
  VLIBCSzHash hash(section.entries.size());
  for (const auto& [key, value] : section.entries) {
    hash.set(key, value);
  }
  return hash;
}

}  // namespace admin

#endif
