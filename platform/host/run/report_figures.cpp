#include "run/report_figures.hpp"

#include <algorithm>
#include <charconv>
#include <functional>
#include <map>
#include <string_view>
#include <unordered_set>

#include "run/page_lines.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"

namespace host {
namespace {

std::optional<std::uint64_t> number_of(std::string_view text) {
  std::uint64_t number = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  return error == std::errc() && end == text.data() + text.size() ? std::optional(number)
                                                                  : std::nullopt;
}

double percent_of(std::uint64_t part, std::uint64_t whole) {
  return static_cast<double>(part) * 100.0 / static_cast<double>(whole);
}

// --- Blocks -------------------------------------------------------------------------------------

using Row = std::vector<std::string>;
enum class Line { row, last, damaged };

// What one report's block tells. Each line goes to `take`; the figures count only after the last.
class Block {
 public:
  Block() = default;
  Block(const Block&) = delete;
  virtual ~Block() = default;
  virtual Line take(std::string_view line) = 0;
};

class VolumeBlock : public Block {
 public:
  Line take(std::string_view line) override {
    if (line == "];") {
      return Line::last;
    }
    const std::optional<Row> row = row_of(line);
    if (!row || row->size() != 5) {
      return Line::damaged;
    }
    const auto used = number_of((*row)[1]);
    const auto free = number_of((*row)[2]);
    if (!used || !free) {
      return Line::damaged;
    }
    const std::uint64_t size = *used + *free;
    if (size > 0 && (!fullest_ || percent_of(*used, size) > fullest_->percent)) {
      fullest_ = FullestVolume{(*row)[0], percent_of(*used, size)};
      fullest_->days = number_of((*row)[4]).value_or(0);
    }
    return Line::row;
  }

  const std::optional<FullestVolume>& fullest() const { return fullest_; }

 private:
  std::optional<FullestVolume> fullest_;
};

// The history tells a volume that is full within a day from one that doesn't grow: the page's
// number is 0 for both.
class HistoryBlock : public Block {
 public:
  Line take(std::string_view line) override {
    constexpr std::string_view kOpening = "' : [";
    if (line == "};") {
      return Line::last;
    }
    if (line == "]" || line == "],") {
      return Line::row;
    }
    if (line.size() > kOpening.size() && line.starts_with('\'') && line.ends_with(kOpening)) {
      line.remove_prefix(1);
      line.remove_suffix(kOpening.size());
      samples_ = &volumes_[std::string(line)];
      return Line::row;
    }
    const std::optional<Row> row = row_of(line);
    if (!row || row->size() != 2 || samples_ == nullptr) {
      return Line::damaged;
    }
    double percent = 0;
    const auto date = number_of((*row)[0]);
    const std::string& text = (*row)[1];
    if (date &&
        std::from_chars(text.data(), text.data() + text.size(), percent).ec == std::errc()) {
      samples_->add(static_cast<double>(*date), percent);
    }
    return Line::row;
  }

  // What the page's `days`, which is 0 for two of these, means. The page's script judges alike.
  Outlook outlook(const std::string& volume, std::uint64_t days) const {
    constexpr std::uint64_t kMostSensibleDays = 36525;
    if (days > 0) {
      return days <= kMostSensibleDays ? Outlook::days : Outlook::no_growth;
    }
    const auto found = volumes_.find(volume);
    return found == volumes_.end() ? Outlook::unknown : found->second.outlook();
  }

 private:
  // The newest sample comes first.
  class Samples {
   public:
    void add(double date, double percent) {
      if (!newest_) {
        newest_ = date;
        percent_ = percent;
      }
      oldest_ = date;
      if (daily_growth_ == 0 && percent < percent_ && date < *newest_) {
        daily_growth_ = (percent_ - percent) / (*newest_ - date) * kDay;
      }
    }
    Outlook outlook() const {
      constexpr double kShortestHistory = 3600;  // a first run stores a sample of its own
      if (!newest_ || *newest_ - oldest_ < kShortestHistory) {
        return Outlook::unknown;
      }
      constexpr double kSoon = 1.5;  // days; the program's estimate is cut down to whole ones
      return daily_growth_ * kSoon > 100 - percent_ ? Outlook::soon : Outlook::no_growth;
    }

   private:
    static constexpr double kDay = 86400;
    std::optional<double> newest_;
    double oldest_ = 0;
    double percent_ = 0;
    double daily_growth_ = 0;  // per cent of the volume
  };
  std::map<std::string, Samples> volumes_;
  Samples* samples_ = nullptr;
};

class ShareBlock : public Block {
 public:
  Line take(std::string_view line) override {
    if (line == "];") {
      return Line::last;
    }
    const std::optional<Row> row = row_of(line);
    const auto size = row && row->size() == 3 ? number_of((*row)[2]) : std::nullopt;
    if (!size) {
      return Line::damaged;
    }
    if (!largest_ || *size > largest_->size) {
      largest_ = LargestShare{(*row)[0], *size};
    }
    return Line::row;
  }

  const std::optional<LargestShare>& largest() const { return largest_; }

 private:
  std::optional<LargestShare> largest_;
};

// Account names stand there unescaped, so a row is read from its end: numbers hold no quotes.
class QuotaBlock : public Block {
 public:
  Line take(std::string_view line) override {
    const bool is_last = line.ends_with("]}");
    if (line.starts_with("['")) {
      if (!take_user(line.substr(2))) {
        return Line::damaged;
      }
    } else if (line.starts_with('\'') && line.ends_with("' : [")) {
      rows_ = 0;
    } else if (line.find_first_not_of("]}, ") != std::string_view::npos) {
      return Line::damaged;
    }
    return is_last ? Line::last : Line::row;
  }

  std::optional<QuotaFigures> figures() const {
    QuotaFigures figures{{percents_.begin(), percents_.end()}, is_cut_};
    std::stable_sort(figures.users.begin(), figures.users.end(),
                     [](const auto& a, const auto& b) { return a.second > b.second; });
    return has_users_ ? std::optional(std::move(figures)) : std::nullopt;
  }

 private:
  bool take_user(std::string_view row) {
    constexpr std::string_view kSeparator = "', ";
    constexpr double kNearlyFull = 90.0;
    const std::size_t end = row.rfind(kSeparator);
    if (end == std::string_view::npos) {
      return false;
    }
    const std::string name(row.substr(0, end));
    row.remove_prefix(end + kSeparator.size());
    const std::vector<std::string_view> numbers = comma_words(row.substr(0, row.find(']')));
    const auto quota = numbers.size() == 3 ? number_of(numbers[0]) : std::nullopt;
    const auto used = numbers.size() == 3 ? number_of(numbers[1]) : std::nullopt;
    if (!quota || !used) {
      return false;
    }
    if (*quota > 0 && percent_of(*used, *quota) > kNearlyFull) {
      double& percent = percents_[name];
      percent = std::max(percent, percent_of(*used, *quota));
    }
    has_users_ = true;
    is_cut_ = is_cut_ || ++rows_ >= kMostQuotaUsers;
    return true;
  }

  std::map<std::string, double> percents_;
  std::size_t rows_ = 0;
  bool has_users_ = false;
  bool is_cut_ = false;
};

class DuplicateBlock : public Block {
 public:
  Line take(std::string_view line) override {
    if (line == "];") {
      return Line::last;
    }
    const std::optional<Row> row = row_of(line);
    const auto group = row && row->size() == 5 ? number_of((*row)[0]) : std::nullopt;
    const auto size = group ? number_of((*row)[3]) : std::nullopt;
    if (!size) {
      return Line::damaged;
    }
    if (*group != group_) {
      group_ = *group;
      paths_.clear();
    }
    // A file of two shares that overlap stands there twice, and frees nothing.
    const bool is_news = paths_.insert(std::hash<std::string>{}((*row)[2])).second;
    if (is_news && paths_.size() > 1 && __builtin_add_overflow(bytes_, *size, &bytes_)) {
      return Line::damaged;
    }
    return Line::row;
  }

  DuplicateFigures figures(bool is_confirmed) const {
    return {bytes_, is_confirmed, group_ >= kMostDuplicateGroups};
  }

 private:
  std::unordered_set<std::size_t> paths_;  // of the present group, as hashes
  std::uint64_t group_ = 0;
  std::uint64_t bytes_ = 0;
};

// --- The page -----------------------------------------------------------------------------------

// A block of the page, and how far it has been read. The first one counts.
struct Place {
  std::string_view opening;
  Block* block;
  enum class State { absent, open, whole, damaged } state = State::absent;
};

// Puts `line` into the open block, or opens the one that it begins.
void take_line(std::vector<Place>& places, Place*& open, std::string_view line) {
  if (open == nullptr) {
    const auto found = std::find_if(places.begin(), places.end(), [line](const Place& place) {
      return place.opening == line && place.state == Place::State::absent;
    });
    if (found != places.end()) {
      found->state = Place::State::open;
      open = &*found;
    }
    return;
  }
  const Line taken = open->block->take(line);
  if (taken != Line::row) {
    open->state = taken == Line::last ? Place::State::whole : Place::State::damaged;
    open = nullptr;
  }
}

}  // namespace

ReportFigures read_figures(const char* path) {
  const ErrnoKeeper keeper;
  VolumeBlock volumes;
  HistoryBlock history;
  ShareBlock shares;
  QuotaBlock quota;
  DuplicateBlock duplicates;
  std::vector<Place> places = {{"var vornVolumeUsageData = [", &volumes},
                               {"var vornVolumeUsageDataHistory = {", &history},
                               {"var vornShareListData = [", &shares},
                               {"var vornQuotaUsageTable = {", &quota},
                               {"var vornDuplicateFileData = [", &duplicates}};
  const auto is_whole = [&places](const Block& block) {
    return std::any_of(places.begin(), places.end(), [&block](const Place& place) {
      return place.block == &block && place.state == Place::State::whole;
    });
  };
  bool is_confirmed = false;
  Place* open = nullptr;
  PageLines lines(path);
  for (std::string line; lines.next(line);) {
    is_confirmed = is_confirmed || (open == nullptr && line == "var vornDuplicateHashMatch = 1;");
    take_line(places, open, line);
  }
  ReportFigures figures;
  if (is_whole(volumes) && volumes.fullest()) {
    figures.volume = volumes.fullest();
    if (is_whole(history)) {
      figures.volume->outlook = history.outlook(figures.volume->name, figures.volume->days);
    }
  }
  if (is_whole(shares)) {
    figures.share = shares.largest();
  }
  if (is_whole(quota)) {
    figures.quota = quota.figures();
  }
  // Groups that lie behind the limit of the read are like those that the page lacks.
  const bool is_part = open != nullptr && open->block == &duplicates && lines.limit_is_reached();
  if (is_whole(duplicates) || is_part) {
    figures.duplicates = duplicates.figures(is_confirmed);
    figures.duplicates->is_cut = figures.duplicates->is_cut || is_part;
  }
  return figures;
}

}  // namespace host
