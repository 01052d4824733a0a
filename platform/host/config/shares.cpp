#include "config/shares.hpp"

#include <strings.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>
#include <unordered_set>

#include "base/host_log.hpp"
#include "base/silence.hpp"
#include "base/text_containers.hpp"
#include "vorn/base/utf8.hpp"
#include "vorn/base/words.hpp"
#include "vorn/config.h"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vorn/share.h"

namespace host {
namespace {

constexpr std::size_t kLongestName = 64;
// The program's path buffers hold 4096 bytes; half of that is for what lies below the share.
constexpr std::size_t kLongestPath = 2048;

// Whether a column of SQLite's NUMERIC affinity would store `text` as a number.
bool is_number(std::string_view text) {
  text = trimmed(text);
  const auto skip_digits = [&text] {
    const std::size_t count = std::min(text.find_first_not_of("0123456789"), text.size());
    text.remove_prefix(count);
    return count;
  };
  if (!text.empty() && (text.front() == '+' || text.front() == '-')) {
    text.remove_prefix(1);
  }
  std::size_t digits = skip_digits();
  if (!text.empty() && text.front() == '.') {
    text.remove_prefix(1);
    digits += skip_digits();
  }
  if (digits == 0) {
    return false;
  }
  if (!text.empty() && (text.front() == 'e' || text.front() == 'E')) {
    text.remove_prefix(1);
    if (!text.empty() && (text.front() == '+' || text.front() == '-')) {
      text.remove_prefix(1);
    }
    return skip_digits() > 0 && text.empty();
  }
  return text.empty();
}

// Whether the section says that the share is walked on network file systems.
bool wants_network(const std::string& name, const VLIBCSzHash& section) {
  const char* value = section.find("network");
  const bool wanted = value != nullptr && strcasecmp(value, "yes") == 0;
  if (value != nullptr && *value != '\0' && !wanted && strcasecmp(value, "no") != 0) {
    log_line(
        "share \"%s\": network \"%.80s\" is neither yes nor no, so it counts as no; run vornctl "
        "share set NAME --network, or --no-network",
        name.c_str(), value);
  }
  return wanted;
}

Share make_share(const std::string& name, const VLIBCSzHash& section) {
  Share share{name, {}, {}, {}, wants_network(name, section)};
  const char* path = section.find("path");
  std::string_view folder = path == nullptr ? "" : path;
  if (const char* error = share_path_error(folder); error != nullptr) {
    share.path_error = error;
  } else {
    while (folder.size() > 1 && folder.back() == '/') {
      folder.remove_suffix(1);
    }
    share.path = folder;
  }
  if (const char* index = section.find("file_index"); index != nullptr) {
    share.file_index = index;
  }
  return share;
}

std::optional<std::vector<Share>>& known_shares() {
  static std::optional<std::vector<Share>> shares;
  return shares;
}

std::vector<std::string>& known_left_out() {
  static std::vector<std::string> names;
  return names;
}

// The share whose folder was asked for last: a run walks one share after another, and asks for each
// folder when it comes to it.
const Share*& share_in_walk() {
  static const Share* share = nullptr;
  return share;
}

}  // namespace

const char* share_name_error(std::string_view name) {
  if (name.empty() || name.size() > kLongestName) {
    return "it is not 1 to 64 bytes long";
  }
  if (std::strchr("=+-@", name.front()) != nullptr) {
    return "it begins with one of = + - @, which a spreadsheet takes for a formula";
  }
  if (is_number(name)) {
    return "it is a number, which the report would write in another form";
  }
  for (std::string_view rest = name; !rest.empty();) {
    const Utf8Char found = utf8_at(rest);
    if (found.length == 0) {
      return "it is not UTF-8";
    }
    if (is_control(found.code) || found.code == 0x2028 || found.code == 0x2029) {
      return "it holds a control character";
    }
    if (found.code < 0x80 && std::strchr("'\"`\\<>/,", static_cast<char>(found.code)) != nullptr) {
      return "it holds a quote, backslash, < > / or comma";
    }
    rest.remove_prefix(found.length);
  }
  return nullptr;
}

const char* share_path_error(std::string_view path) {
  if (path.empty()) {
    return "it has no path; give it one with vornctl share set NAME --path FOLDER";
  }
  if (path.front() != '/') {
    return "its path is not absolute; write it from / on";
  }
  if (path.size() > kLongestPath) {
    return "its path is longer than 2048 bytes; give a shorter one, a bind mount for example";
  }
  if (path.find('\'') != std::string_view::npos) {
    return "its path holds a single quote; rename the folder or bind-mount it elsewhere";
  }
  if (std::any_of(path.begin(), path.end(),
                  [](unsigned char c) { return c < 0x20 || c == 0x7F; })) {
    return "its path holds a control character; rename the folder or bind-mount it elsewhere";
  }
  return nullptr;
}

std::optional<std::vector<Share>> load_shares(const char* file,
                                              std::vector<std::string>* left_out) {
  const std::unique_ptr<VLIBCSzList, decltype(&VLIBCSzListFree)> names(VLIBCSzListAlloc(0),
                                                                       &VLIBCSzListFree);
  VLIBCSzList* list = names.get();
  if (list == nullptr || VLIBCFileEnumSection(file, &list) < 0) {
    return std::nullopt;
  }
  std::vector<Share> shares;
  std::unordered_set<std::string_view> seen;
  for (const std::string& name : list->texts) {
    if (!seen.insert(name).second) {
      continue;  // the section reader has refused the first of them, with a line
    }
    if (const char* error = share_name_error(name); error != nullptr) {
      log_line("share \"%s\" is left out: %s; rename it with vornctl share set", name.c_str(),
               error);
      if (left_out != nullptr) {
        left_out->push_back(name);
      }
      continue;
    }
    VLIBCSzHash section(0);
    VLIBCSzHash* filled = &section;
    if (VLIBCFileGetSection(file, name.c_str(), &filled) >= 0) {
      shares.push_back(make_share(name, section));
    } else {
      log_line("share \"%s\" is left out of every report until its section in %s is corrected",
               name.c_str(), file);
      if (left_out != nullptr) {
        left_out->push_back(name);
      }
    }
  }
  return shares;
}

bool is_in_network_share(std::string_view path) {
  const Share* share = share_in_walk();
  if (share == nullptr || !share->network || !path.starts_with(share->path)) {
    return false;
  }
  const std::string_view rest = path.substr(share->path.size());
  return rest.empty() || rest.front() == '/' || share->path == "/";
}

const std::vector<Share>* all_shares() {
  std::optional<std::vector<Share>>& shares = known_shares();
  if (!shares) {
    known_left_out().clear();
    shares = load_shares(VORN_PATH_SHARES, &known_left_out());
  }
  return shares ? &*shares : nullptr;
}

const std::vector<Share>* read_shares() {
  share_in_walk() = nullptr;
  known_shares().reset();
  return all_shares();
}

const std::vector<std::string>& shares_left_out() {
  return known_left_out();
}

const Share* find_share(const char* name) {
  const auto* shares = name == nullptr ? nullptr : all_shares();
  if (shares == nullptr) {
    return nullptr;
  }
  const auto found = std::find_if(shares->begin(), shares->end(),
                                  [name](const Share& share) { return share.name == name; });
  return found == shares->end() ? nullptr : &*found;
}

}  // namespace host

int VORNShareEnum(VLIBCSzList** list, int /*flags*/) try {
  const auto* shares = host::all_shares();
  if (list == nullptr || *list == nullptr || shares == nullptr) {
    return -1;
  }
  if (shares->empty()) {
    host::log_line("no shares in %s; add each with vornctl share add NAME FOLDER",
                   VORN_PATH_SHARES);
  }
  for (const host::Share& share : *shares) {
    (*list)->texts.push_back(share.name);
  }
  return static_cast<int>(shares->size());
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VORNSharePathGet(const char* share, char* path, size_t size) try {
  const host::Share* found = host::find_share(share);
  if (found == nullptr || path == nullptr) {
    host::log_line("share \"%s\" is not in %s; run vornctl share add NAME FOLDER",
                   share == nullptr ? "" : share, VORN_PATH_SHARES);
    errno = ENOENT;
    return -1;
  }
  if (!found->path_error.empty()) {
    host::log_line("share \"%s\" can't be read: %s in %s; run vornctl share set NAME path FOLDER",
                   share, found->path_error.c_str(), VORN_PATH_SHARES);
    errno = EINVAL;
    return -1;
  }
  if (host::is_silent(found->path)) {
    host::log_line(
        "share \"%s\" can't be read: %s doesn't answer; see to the server or daemon behind its "
        "mount",
        share, found->path.c_str());
    errno = ETIMEDOUT;
    return -1;
  }
  host::share_in_walk() = found;
  if (found->path.size() >= size) {
    errno = ENAMETOOLONG;
    return -1;
  }
  std::memcpy(path, found->path.c_str(), found->path.size() + 1);
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazMatchShare(const VLIBCSzHash* hash, const char* share) try {
  const char* list = VLIBCSzHashGetValue(hash, "share_list");
  if (share == nullptr) {
    return 0;
  }
  const auto words = host::comma_words(list == nullptr ? "" : list);
  return words.empty() || std::find(words.begin(), words.end(), share) != words.end() ? 1 : 0;
} catch (...) {
  errno = ENOMEM;
  return 0;
}

int VornQazGetSharePathHash(VLIBCSzHash** hash) try {
  const auto* shares = host::all_shares();
  if (hash == nullptr || *hash == nullptr || shares == nullptr) {
    return -1;
  }
  int count = 0;
  for (const host::Share& share : *shares) {
    if (!share.path.empty()) {
      (*hash)->set(share.name, share.path);
      ++count;
    }
  }
  return count;
} catch (...) {
  errno = ENOMEM;
  return -1;
}
