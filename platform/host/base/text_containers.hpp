// What stands behind the text hash and the text list of vorn/text.h.
#ifndef VORN_HOST_TEXT_CONTAINERS_HPP
#define VORN_HOST_TEXT_CONTAINERS_HPP

#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "vorn/text.h"

namespace host {

enum class KeyCase { exact, ascii_folded };

struct KeyHash {
  using is_transparent = void;
  KeyCase key_case = KeyCase::exact;
  std::size_t operator()(std::string_view key) const noexcept;
};

struct KeyEqual {
  using is_transparent = void;
  KeyCase key_case = KeyCase::exact;
  bool operator()(std::string_view a, std::string_view b) const noexcept;
};

// Asked for a key that a hash lacks; nothing when the key has no value.
using Resolver = std::function<std::optional<std::string>(std::string_view key)>;

}  // namespace host

// Look-ups happen for every file of a share, so they allocate nothing once a key is known.
struct VLIBCSzHash {
 public:
  // Entries in the order of their keys, those of a resolver not included unless already asked for.
  using Entry = std::pair<std::string_view, std::string_view>;

  explicit VLIBCSzHash(std::size_t slots) { entries_.reserve(slots); }

  const char* find(std::string_view key) const;
  void set(std::string_view key, std::string_view value);
  void remove(std::string_view key);
  std::vector<Entry> sorted() const;

  // The section of a file that the entries were read from, as it was then: who writes them back
  // means what is different from it.
  struct Origin {
    std::string file;
    std::string section;
    std::map<std::string, std::string, std::less<>> entries;
  };
  std::optional<Origin> origin;

  // Both the answers and the failures of `resolver` are kept for the life of the hash.
  void resolve_with(host::Resolver resolver) { resolver_ = std::move(resolver); }
  // From now on keys that differ in ASCII case only are one key; the first one's value wins.
  void fold_case();

 private:
  // No value: the resolver was asked and knows none.
  using Map =
      std::unordered_map<std::string, std::optional<std::string>, host::KeyHash, host::KeyEqual>;

  mutable Map entries_;
  host::Resolver resolver_;
};

struct VLIBCSzList {
  // A deque, because texts that were handed out must survive a push.
  std::deque<std::string> texts;
};

#endif
