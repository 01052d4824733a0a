#include "facts/folder_totals.hpp"

#include <algorithm>
#include <tuple>
#include <utility>

namespace vornreport {

bool FolderTotals::comes_before(const Total& one, const Total& two) {
  return std::tuple(two.amount.bytes, one.name->length, one.ordinal) <
         std::tuple(one.amount.bytes, two.name->length, two.ordinal);
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
  std::shared_ptr<const Name> above = inside_.empty() ? nullptr : inside_.back().name;
  const size_t length = above == nullptr ? 0 : above->length + name.size() + 1;
  auto own = std::make_shared<const Name>(
      Name{std::move(above), std::string(inside_.empty() ? "." : name), length});
  inside_.push_back({share_, std::move(own), volume, {}, 0, 0});
}

void FolderTotals::file(uint64_t bytes, uint32_t changed) {
  if (!inside_.empty()) {
    inside_.back().amount.add(bytes);
    inside_.back().newest = std::max(inside_.back().newest, changed);
  }
}

void FolderTotals::leave() {
  Total total = std::move(inside_.back());
  inside_.pop_back();
  if (!inside_.empty()) {
    inside_.back().amount.add(total.amount);
    inside_.back().newest = std::max(inside_.back().newest, total.newest);
  }
  total.ordinal = left_++;
  // The order of the heap is that of the list, so that its front is the list's last.
  if (kept_.size() == kMost) {
    if (!comes_before(total, kept_.front())) {
      cut_.insert(total.share);
      return;
    }
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
