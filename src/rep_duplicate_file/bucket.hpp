// The files of one size, and the groups among them.
#pragma once

#include <cstdint>
#include <vector>

#include "candidate.hpp"
#include "vorn/list.h"

namespace vornreport {

// The candidates of a bucket, and for each the later ones with an equal sample, found by look-up:
// comparing every pair's samples would be a million millions for a million files.
class Bucket {
 public:
  // Takes over the list, which isn't empty.
  explicit Bucket(QAZLLNode* candidates);
  ~Bucket();
  Bucket(const Bucket&) = delete;
  Bucket& operator=(const Bucket&) = delete;

  uint64_t file_size() const { return files_.front()->size; }  // of each, in bytes
  const std::vector<dup_file_node*>& files() const { return files_; }

  // Appends the files whose digests the comparison will ask for, as far as there are samples: the
  // first with a sample is compared with every other one.
  void add_compared(std::vector<dup_file_node*>& compared);

  // As read_fast_digests().
  int read_samples() const { return read_fast_digests(candidates_); }

  // Appends every group to `groups`, in the order of their first members, and prints every pair
  // that doesn't match.
  void find_groups(QAZLLNode** groups);

  // Empties the bucket and the list of its groups.
  void release(QAZLLNode** groups);

 private:
  void sort_by_sample();
  template <typename Less>
  void sort(Less less);
  void gather_matches(uint32_t first, dup_file_node*& chain);
  void gather_digested(uint32_t first, dup_file_node*& chain);
  void cut_short();

  QAZLLNode* candidates_;
  std::vector<dup_file_node*> files_;  // in list order
  std::vector<uint32_t> sorted_;       // indices of files_, by sample; cut short, by digest, too
  std::vector<uint32_t> place_;        // of each file in sorted_
  bool is_sorted_ = false;             // with all the samples that there will be
  bool is_cut_short_ = false;
};

}  // namespace vornreport
