// The texts of a snapshot are lines of fields with tabs between them; in names a backslash, a tab
// and a line feed stand as \\, \t and \n, and all other bytes as they are. The first line of each
// text is the version. A line's first field says what it is:
//
//   summary   s name whole            a share: "1" when it was read as a whole
//             v volume files bytes    what the share above holds on a volume
//             q volume user used quota
//   details   O names                 owners were kept: everyone, or these
//             T                       types were kept
//             s name all              a share: "1" when all its folders follow
//             v volume                what follows lies on this volume of it
//             o owner files bytes
//             t type files bytes
//             f folder files bytes
//
// A reader leaves lines aside that it doesn't know; what would mislead one needs another version.
#include "facts/snapshot.hpp"

#include <algorithm>
#include <charconv>
#include <string_view>
#include <tuple>
#include <utility>

namespace vornreport {
namespace {

constexpr std::string_view kVersion = "1";

// --- Writing ------------------------------------------------------------------------------------

void append(std::string& out, std::string_view text) {
  for (const char c : text) {
    switch (c) {
      case '\\':
        out += "\\\\";
        break;
      case '\t':
        out += "\\t";
        break;
      case '\n':
        out += "\\n";
        break;
      default:
        out += c;
    }
  }
}

void append(std::string& out, uint64_t number) {
  out += std::to_string(number);
}

template <typename... Fields>
void add_line(std::string& out, char what, const Fields&... fields) {
  out += what;
  ((out += '\t', append(out, fields)), ...);
  out += '\n';
}

void add_amounts(std::string& out, char what, const std::map<std::string, Amount>& amounts) {
  for (const auto& [name, amount] : amounts) {
    add_line(out, what, name, amount.files, amount.bytes);
  }
}

void add_details(std::string& out, const SnapshotShare& share) {
  add_line(out, 's', share.name, uint64_t{share.has_all_folders});
  for (const SnapshotPart& part : share.parts) {
    add_line(out, 'v', part.volume);
    add_amounts(out, 'o', part.owners);
    add_amounts(out, 't', part.types);
  }
  const std::string* volume = share.parts.empty() ? nullptr : &share.parts.back().volume;
  for (const SnapshotFolder& folder : share.folders) {
    if (volume == nullptr || folder.volume != *volume) {
      volume = &folder.volume;
      add_line(out, 'v', *volume);
    }
    add_line(out, 'f', folder.folder, folder.amount.files, folder.amount.bytes);
  }
}

// --- Reading ------------------------------------------------------------------------------------

std::string unescaped(std::string_view text) {
  std::string out;
  for (size_t i = 0; i < text.size(); ++i) {
    const bool is_escape = text[i] == '\\' && i + 1 < text.size();
    const char c = is_escape ? text[++i] : text[i];
    out += !is_escape ? c : c == 't' ? '\t' : c == 'n' ? '\n' : c;
  }
  return out;
}

// The fields of a line behind its first. Reading on behind the end or what is no number makes it
// broken.
class Line {
 public:
  explicit Line(std::string_view whole) : rest_(whole) {
    field();
    is_broken_ = false;
  }
  std::string text() { return unescaped(field()); }
  uint64_t number() {
    const std::string_view digits = field();
    const char* end = digits.data() + digits.size();
    uint64_t value = 0;
    const auto [stopped, error] = std::from_chars(digits.data(), end, value);
    is_broken_ = is_broken_ || error != std::errc() || stopped != end;
    return value;
  }
  Amount amount() {
    Amount amount;
    amount.files = number();
    amount.bytes = number();
    return amount;
  }
  bool is_broken() const { return is_broken_; }

 private:
  std::string_view field() {
    is_broken_ = is_broken_ || is_at_end_;
    const size_t tab = rest_.find('\t');
    const std::string_view found = rest_.substr(0, tab);
    is_at_end_ = tab == std::string_view::npos;
    rest_.remove_prefix(is_at_end_ ? rest_.size() : tab + 1);
    return found;
  }

  std::string_view rest_;
  bool is_at_end_ = false;
  bool is_broken_ = false;
};

class Parser {
 public:
  explicit Parser(Snapshot& set) : set_(set) {}

  // False when a line can't be what it should be; every line ends with a line feed.
  bool read(std::string_view text, void (Parser::*take)(char what, Line& line)) {
    bool is_first = true;
    while (!text.empty()) {
      const size_t end = text.find('\n');
      if (end == std::string_view::npos) {
        return false;
      }
      const std::string_view whole = text.substr(0, end);
      text.remove_prefix(end + 1);
      if (std::exchange(is_first, false)) {
        if (whole != kVersion) {
          return false;
        }
        continue;
      }
      const std::string_view what = whole.substr(0, whole.find('\t'));
      Line line(whole);
      if (what.size() == 1) {
        (this->*take)(what.front(), line);
      }
      if (line.is_broken() || is_lost_) {
        return false;
      }
    }
    return !is_first;
  }

  void take_summary(char what, Line& line) {
    if (what == 's') {
      share_ = &set_.shares.emplace_back();
      share_->name = line.text();
      share_->is_whole = line.number() != 0;
    } else if (what == 'v' && has(share_)) {
      SnapshotPart& part = share_->parts.emplace_back();
      part.volume = line.text();
      part.total = line.amount();
    } else if (what == 'q') {
      SnapshotQuota& quota = set_.quotas.emplace_back();
      quota.volume = line.text();
      quota.user = line.text();
      quota.used = line.number();
      quota.quota = line.number();
    }
  }

  void take_details(char what, Line& line) {
    if (what == 'O') {
      set_.owners_among = line.text();
    } else if (what == 'T') {
      set_.has_types = true;
    } else if (what == 's') {
      const std::string name = line.text();
      const auto found = std::find_if(set_.shares.begin(), set_.shares.end(),
                                      [&](const SnapshotShare& one) { return one.name == name; });
      share_ = found == set_.shares.end() ? nullptr : &*found;
      part_ = nullptr;
      if (has(share_)) {
        share_->has_all_folders = line.number() != 0;
      }
    } else if (what == 'v' && has(share_)) {
      const std::string volume = line.text();
      const auto found =
          std::find_if(share_->parts.begin(), share_->parts.end(),
                       [&](const SnapshotPart& one) { return one.volume == volume; });
      part_ = found == share_->parts.end() ? nullptr : &*found;
      has(part_);
    } else if ((what == 'o' || what == 't' || what == 'f') && has(part_)) {
      take_amount(what, line);
    }
  }

 private:
  void take_amount(char what, Line& line) {
    std::string name = line.text();
    const Amount amount = line.amount();
    if (what == 'f') {
      share_->folders.push_back({std::move(name), part_->volume, amount});
    } else {
      (what == 'o' ? part_->owners : part_->types).emplace(std::move(name), amount);
    }
  }
  template <typename Thing>
  bool has(const Thing* thing) {
    is_lost_ = is_lost_ || thing == nullptr;
    return thing != nullptr;
  }

  Snapshot& set_;
  SnapshotShare* share_ = nullptr;
  SnapshotPart* part_ = nullptr;
  bool is_lost_ = false;
};

}  // namespace

const SnapshotShare* Snapshot::find(const std::string& share) const {
  const auto found = std::find_if(shares.begin(), shares.end(),
                                  [&](const SnapshotShare& one) { return one.name == share; });
  return found == shares.end() ? nullptr : &*found;
}

size_t Snapshot::folder_count() const {
  size_t count = 0;
  for (const SnapshotShare& share : shares) {
    count += share.folders.size();
  }
  return count;
}

std::optional<uint64_t> Snapshot::smallest_folder() const {
  std::optional<uint64_t> smallest;
  for (const SnapshotShare& share : shares) {
    for (const SnapshotFolder& folder : share.folders) {
      smallest = std::min(smallest.value_or(UINT64_MAX), folder.amount.bytes);
    }
  }
  return smallest;
}

void Snapshot::cut_folders(size_t most) {
  if (folder_count() <= most) {
    return;
  }
  std::vector<std::pair<SnapshotShare*, SnapshotFolder>> all;
  for (SnapshotShare& share : shares) {
    for (SnapshotFolder& folder : std::exchange(share.folders, {})) {
      all.emplace_back(&share, std::move(folder));
    }
  }
  std::stable_sort(all.begin(), all.end(), [](const auto& one, const auto& two) {
    return std::tuple(two.second.amount.bytes, one.second.folder.size()) <
           std::tuple(one.second.amount.bytes, two.second.folder.size());
  });
  for (size_t i = 0; i < all.size(); ++i) {
    if (i < most) {
      all[i].first->folders.push_back(std::move(all[i].second));
    } else {
      all[i].first->has_all_folders = false;
    }
  }
}

SnapshotText to_text(const Snapshot& snapshot) {
  SnapshotText text{std::string(kVersion) + "\n", std::string(kVersion) + "\n"};
  if (snapshot.owners_among) {
    add_line(text.details, 'O', *snapshot.owners_among);
  }
  if (snapshot.has_types) {
    add_line(text.details, 'T');
  }
  for (const SnapshotShare& share : snapshot.shares) {
    add_line(text.summary, 's', share.name, uint64_t{share.is_whole});
    for (const SnapshotPart& part : share.parts) {
      add_line(text.summary, 'v', part.volume, part.total.files, part.total.bytes);
    }
    add_details(text.details, share);
  }
  for (const SnapshotQuota& quota : snapshot.quotas) {
    add_line(text.summary, 'q', quota.volume, quota.user, quota.used, quota.quota);
  }
  return text;
}

std::optional<Snapshot> snapshot_of(int64_t time, const SnapshotText& text) {
  Snapshot set;
  set.time = time;
  if (!Parser(set).read(text.summary, &Parser::take_summary)) {
    return std::nullopt;
  }
  if (!text.details.empty() && !Parser(set).read(text.details, &Parser::take_details)) {
    return std::nullopt;
  }
  return set;
}

void SnapshotSamples::add(const Snapshot& snapshot) {
  for (const SnapshotShare& share : snapshot.shares) {
    Amount total;
    for (const SnapshotPart& part : share.parts) {
      total.add(part.total);
    }
    if (share.is_whole) {
      shares[share.name].push_back({snapshot.time, total.bytes});
    }
  }
  for (const SnapshotQuota& quota : snapshot.quotas) {
    if (const auto user = users.find({quota.volume, quota.user}); user != users.end()) {
      user->second.push_back({snapshot.time, quota.used});
    }
  }
}

}  // namespace vornreport
