#include "facts/folder_totals.hpp"

#include <algorithm>
#include <tuple>
#include <utility>

namespace vornreport {

bool FolderTotals::comes_before(const Total& one, const Total& two) {
  return std::tuple(two.amount.bytes, one.length, one.ordinal) <
         std::tuple(one.amount.bytes, two.length, two.ordinal);
}

std::string FolderTotals::path_of(const Name& name) {
  if (name.above == nullptr || name.above->above == nullptr) {
    return name.text;  // the top, or a folder in it
  }
  return path_of(*name.above) + "/" + name.text;
}

void FolderTotals::begin_share(size_t share) {
  share_ = share;
  inside_.clear();
}

void FolderTotals::forget_share(size_t share) {
  std::erase_if(kept_, [share](const Total& total) { return total.share == share; });
  std::make_heap(kept_.begin(), kept_.end(), comes_before);
  cut_.erase(share);
  inside_.clear();
}

void FolderTotals::enter(std::string_view name, size_t volume) {
  const bool is_top = inside_.empty();
  const size_t length = is_top ? 0 : inside_.back().total.length + name.size() + 1;
  inside_.push_back(
      {std::string(is_top ? "." : name), {share_, nullptr, length, volume, {}, 0, 0}});
}

void FolderTotals::file(uint64_t bytes, uint32_t changed) {
  if (!inside_.empty()) {
    Total& total = inside_.back().total;
    total.amount.add(bytes);
    total.newest = std::max(total.newest, changed);
  }
}

// Names the folders that the walk is in, from the top down.
void FolderTotals::name_places() {
  std::shared_ptr<const Name> above;
  for (Place& place : inside_) {
    if (!place.total.name) {
      place.total.name =
          std::make_shared<const Name>(Name{std::move(above), std::move(place.text)});
    }
    above = place.total.name;
  }
}

void FolderTotals::leave() {
  inside_.back().total.ordinal = left_++;
  // The order of the heap is that of the list, so that its front is the list's last.
  const bool is_full = kept_.size() == kMost;
  const bool is_kept = !is_full || comes_before(inside_.back().total, kept_.front());
  if (is_kept) {
    name_places();
  }
  Total total = std::move(inside_.back().total);
  inside_.pop_back();
  if (!inside_.empty()) {
    Total& above = inside_.back().total;
    above.amount.add(total.amount);
    above.newest = std::max(above.newest, total.newest);
  }
  if (!is_kept) {
    cut_.insert(total.share);
    return;
  }
  if (is_full) {
    std::pop_heap(kept_.begin(), kept_.end(), comes_before);
    cut_.insert(kept_.back().share);
    kept_.pop_back();
  }
  kept_.push_back(std::move(total));
  std::push_heap(kept_.begin(), kept_.end(), comes_before);
}

std::vector<LargeFolder> FolderTotals::largest() const {
  std::vector<const Total*> order;
  order.reserve(kept_.size());
  for (const Total& total : kept_) {
    order.push_back(&total);
  }
  std::sort(order.begin(), order.end(),
            [](const Total* one, const Total* two) { return comes_before(*one, *two); });
  std::vector<LargeFolder> folders;
  folders.reserve(order.size());
  for (const Total* total : order) {
    folders.push_back(
        {total->share, path_of(*total->name), total->volume, total->amount, total->newest});
  }
  return folders;
}

}  // namespace vornreport
