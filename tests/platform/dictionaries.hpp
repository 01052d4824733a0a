// Dictionaries for tests of what facts say: the group "mail" is the product's, the others are those
// of the folder lang.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

#include "support.hpp"

namespace support {

inline void write_dictionaries(const std::string& folder) {
  for (const std::string name : {"/en.json", "/de.json", "/fr.json"}) {
    const auto at = [&](const char* lang) {
      return nlohmann::json::parse(read_file(VORN_TEST_SOURCE_DIR + (lang + name)));
    };
    auto texts = at("/reportUI/template/lang");
    texts.update(at("/tests/platform/lang"));
    write_file(folder + name, texts.dump());
  }
}

}  // namespace support
