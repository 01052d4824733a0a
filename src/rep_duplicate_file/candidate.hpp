// Files of one size whose contents are to be compared.
#pragma once

#include <sys/types.h>

#include <array>
#include <cstdint>
#include <string>
#include <utility>

#include "vorn/list.h"

namespace vornreport {

// A 128-bit digest of a sample. Equal samples have equal digests; that two others meet is as good
// as impossible, and would cost one comparison of whole files.
using SampleDigest = std::pair<uint64_t, uint64_t>;

// What became of a file's sample.
enum class SampleState : uint8_t {
  kUnread,
  kLeased,  // to be tried once more: somebody holds a lease, who gives it up within a moment
  kRead,
  kNotOpened,  // for `failure`
  kNotMapped   // opened, but not read
};

// Why a file has no digest: VornQazGetFileMd5's result and errno. Result 0: it hasn't failed.
struct DigestFailure {
  int32_t result;
  int32_t error;
};

// One file. A bucket can hold a million of them, so a node holds real texts, not their widest
// fields, and the members of a group are the candidates themselves, linked by `next`.
struct dup_file_node {
  uint64_t size;    // bytes
  int32_t mtime;    // seconds since the epoch
  int32_t ordinal;  // place in the size bucket, from 1
  std::string path;
  const char* share;         // interned for the life of the process
  const char* share_folder;  // belongs to the share path hash; null when unknown
  dup_file_node* next;       // the member of the group that was found before this one
  SampleDigest sample;       // of 4096 bytes, filled up with zeros
  dev_t device;              // of the file that the sample was read from, which the digest
  ino_t inode;               // must be of as well
  std::array<char, 32> md5;  // hexadecimal digits, once `digest_done`
  DigestFailure failure;     // of the sample or the digest; it isn't asked for again
  SampleState sample_state;
  bool is_ahead;     // md5 or failure are there, but nobody has asked for them
  bool digest_done;  // and asked for
  bool grouped;
};

// The file of a node of the candidate or the group list.
inline dup_file_node* file_of(const QAZLLNode* node) {
  return static_cast<dup_file_node*>(node->data);
}

// Bytes of a sample.
inline constexpr uint64_t kSampleSize = 4096;

// Makes a candidate of a row (share, path, size, modification time, file name) and appends it to
// the list. 0, or -1 (logged).
int add_candidate(QAZLLNode** candidates, char* const* columns, int32_t ordinal,
                  const char* share_folder);

// Two steps that need nothing but the file, so that threads may take them ahead, for different
// files at once. What failed is noted silently; who needs the result tells. errno is left alone.
//
// Tries to read a sample: the whole file up to 4096 bytes, else 4096 bytes from its middle. Only a
// regular file below its share's folder is opened, and not through a link.
void read_sample_ahead(dup_file_node& file);
// Computes the digest of a file whose sample was read.
void compute_digest_ahead(dup_file_node& file);

// Sees to the sample of every candidate, read ahead or not. A file that can't be read (logged)
// keeps a sample of zeros and gets no digest. Ends when the comparison's time does. 0; -1 for an
// empty list.
int read_fast_digests(const QAZLLNode* candidates);

// Compares two files of one size by their digests, each of which is computed once, of the file that
// the sample was read from. 0 when they match, 1 when they differ, -1 (logged) when a digest can't
// be had.
int compare_files(dup_file_node& a, dup_file_node& b);

// Frees a bucket's lists; both are empty then.
void release_bucket(QAZLLNode** groups, QAZLLNode** candidates);

}  // namespace vornreport
