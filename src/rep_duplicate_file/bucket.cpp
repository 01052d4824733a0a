#include "bucket.hpp"

#include <algorithm>
#include <numeric>
#include <tuple>

#include "compare_limit.hpp"
#include "module.hpp"
#include "vornreport/error_log.hpp"

namespace vornreport {
namespace {

// Numbers that go on through the process.
uint64_t g_digested = 0;  // files for which a digest was about to be asked
uint64_t g_grouped = 0;   // files placed into groups

void prepend(dup_file_node& file, dup_file_node*& chain) {
  ++g_grouped;
  file.grouped = true;
  file.next = chain;
  chain = &file;
}

void join(dup_file_node& a, dup_file_node& b, dup_file_node*& chain) {
  if (!a.grouped) {
    prepend(a, chain);
  }
  prepend(b, chain);
}

}  // namespace

Bucket::Bucket(QAZLLNode* candidates) : candidates_(candidates) {
  for (const QAZLLNode* node = candidates; node != nullptr; node = node->next) {
    files_.push_back(file_of(node));
  }
}

Bucket::~Bucket() {
  QAZLLNode* no_groups = nullptr;
  release(&no_groups);
}

void Bucket::release(QAZLLNode** groups) {
  release_bucket(groups, &candidates_);
}

// Sorts the places of all files; those of equal ones keep the list's order.
template <typename Less>
void Bucket::sort(Less less) {
  std::stable_sort(sorted_.begin(), sorted_.end(),
                   [&](uint32_t a, uint32_t b) { return less(*files_[a], *files_[b]); });
  for (uint32_t place = 0; place < sorted_.size(); ++place) {
    place_[sorted_[place]] = place;
  }
}

void Bucket::sort_by_sample() {
  sorted_.resize(files_.size());
  std::iota(sorted_.begin(), sorted_.end(), uint32_t{0});
  place_.resize(files_.size());
  sort([](const dup_file_node& a, const dup_file_node& b) { return a.sample < b.sample; });
}

void Bucket::add_compared(std::vector<dup_file_node*>& compared) {
  sort_by_sample();
  is_sorted_ = std::none_of(files_.begin(), files_.end(), [](const dup_file_node* file) {
    return file->sample_state < SampleState::kRead;
  });
  const auto has_sample = [&](size_t place, const dup_file_node& file) {
    return place < sorted_.size() && files_[sorted_[place]]->sample == file.sample;
  };
  for (size_t i = 0; i < files_.size(); ++i) {
    dup_file_node& file = *files_[i];
    const size_t place = place_[i];  // before the first there is none: it wraps
    if (file.sample_state == SampleState::kRead &&
        (has_sample(place - 1, file) || has_sample(place + 1, file))) {
      compared.push_back(&file);
    }
  }
}

void Bucket::find_groups(QAZLLNode** groups) {
  if (!is_sorted_) {
    sort_by_sample();
  }
  for (uint32_t first = 0; first < files_.size(); ++first) {
    if (files_[first]->grouped) {
      continue;
    }
    dup_file_node* chain = nullptr;
    if (!is_cut_short_) {
      gather_matches(first, chain);
    }
    if (is_cut_short_) {
      gather_digested(first, chain);
    }
    if (chain != nullptr && QAZLLadd(groups, chain, nullptr) < 0) {
      REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "add node failed");
    }
  }
}

// Puts the file and all later ones that match it before `chain`, the last match first.
void Bucket::gather_matches(uint32_t first, dup_file_node*& chain) {
  dup_file_node& a = *files_[first];
  for (size_t place = place_[first] + size_t{1}; place < sorted_.size(); ++place) {
    dup_file_node& b = *files_[sorted_[place]];
    if (b.sample != a.sample) {
      break;
    }
    if (b.grouped) {
      continue;
    }
    if (past_compare_limit(a.size)) {
      cut_short();
      break;
    }
    g_digested += (a.digest_done ? 0U : 1U) + (b.digest_done ? 0U : 1U);
    const int result = compare_files(a, b);
    if (result < 0 && past_compare_limit(a.size)) {
      cut_short();  // in the middle of a digest
      break;
    }
    if (result != 0) {
      report_trace(kDuplicateModule, __LINE__, "##### match(%llu/%llu), not match file=(%s,%s)\n",
                   static_cast<unsigned long long>(g_grouped),
                   static_cast<unsigned long long>(g_digested), a.path.c_str(), b.path.c_str());
      continue;
    }
    join(a, b, chain);
  }
}

// No pair is walked from now on: of those that have their digests, asked for or ahead, equal ones
// stand together.
void Bucket::cut_short() {
  is_cut_short_ = true;
  for (dup_file_node* file : files_) {
    file->digest_done = file->digest_done || (file->is_ahead && file->failure.result == 0);
  }
  sort([](const dup_file_node& a, const dup_file_node& b) {
    return std::tie(a.sample, a.digest_done, a.md5) < std::tie(b.sample, b.digest_done, b.md5);
  });
}

// As gather_matches(), of what is known already.
void Bucket::gather_digested(uint32_t first, dup_file_node*& chain) {
  dup_file_node& a = *files_[first];
  for (size_t place = place_[first] + size_t{1}; a.digest_done && place < sorted_.size(); ++place) {
    dup_file_node& b = *files_[sorted_[place]];
    if (b.sample != a.sample || !b.digest_done || b.md5 != a.md5) {
      break;
    }
    if (!b.grouped) {
      join(a, b, chain);
    }
  }
}

}  // namespace vornreport
