#include "machine/sqlite_memory.hpp"

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdlib>
#include <cstring>

namespace host {
namespace {

// Size classes: 16 of 64 bytes' step up to 1 KiB, then four for each doubling up to 16 KiB.
// A page of SQLite's cache (4 KiB and its header) falls into the class of 5 KiB.
constexpr unsigned kSmallStepBits = 6;
constexpr unsigned kSmallLimit = 1024;
constexpr unsigned kSmallClasses = kSmallLimit >> kSmallStepBits;
constexpr unsigned kPooledLimit = 16 * 1024;
constexpr unsigned kClassCount = kSmallClasses + 4 * 4;
constexpr std::size_t kSlabSize = std::size_t{128} * 1024;

// A free block holds the link where a used one holds the caller's bytes.
struct FreeBlock {
  FreeBlock* next;
};

// Stands before every block. `home` is the list that the block returns to, null for one of malloc.
struct alignas(16) Header {
  FreeBlock** home;
  int size;
};
static_assert(sizeof(Header) == 16);

std::array<FreeBlock*, kClassCount> free_lists{};
std::byte* slab_next = nullptr;
std::byte* slab_end = nullptr;

constexpr unsigned class_of(unsigned size) {
  if (size <= kSmallLimit) [[likely]] {
    return (size - 1) >> kSmallStepBits;
  }
  const auto width = static_cast<unsigned>(std::bit_width(size - 1));
  const unsigned quarter = (size - 1) >> (width - 3);  // 4 to 7
  return kSmallClasses + (width - 11) * 4 + quarter - 4;
}

constexpr unsigned class_size(unsigned index) {
  if (index < kSmallClasses) {
    return (index + 1) << kSmallStepBits;
  }
  const unsigned above = index - kSmallClasses;
  return (above % 4 + 5) << (above / 4 + 8);
}
static_assert(class_size(class_of(1)) == 64 && class_size(class_of(1024)) == 1024);
static_assert(class_size(class_of(1025)) == 1280 && class_size(class_of(4360)) == 5120);
static_assert(class_of(kPooledLimit) == kClassCount - 1);
static_assert(class_size(kClassCount - 1) == kPooledLimit);

Header* header_of(void* block) {
  return static_cast<Header*>(block) - 1;
}

void* from_system(unsigned size) {
  auto* header = static_cast<Header*>(std::malloc(sizeof(Header) + size));
  if (header == nullptr) {
    return nullptr;
  }
  *header = {nullptr, static_cast<int>(size)};
  return header + 1;
}

// What is left of the old slab, less than one block of this class, is given up.
[[gnu::noinline]] void* carve(unsigned index) {
  const unsigned size = class_size(index);
  const std::size_t needed = sizeof(Header) + size;
  if (static_cast<std::size_t>(slab_end - slab_next) < needed) {
    auto* slab = static_cast<std::byte*>(std::malloc(kSlabSize));
    if (slab == nullptr) {
      return nullptr;
    }
    slab_next = slab;
    slab_end = slab + kSlabSize;
  }
  auto* header = reinterpret_cast<Header*>(slab_next);
  slab_next += needed;
  *header = {&free_lists[index], static_cast<int>(size)};
  return header + 1;
}

// SQLite asks for at least one byte and never for 2 GiB or more.
void* allocate(int bytes) {
  const auto size = static_cast<unsigned>(bytes);
  if (size > kPooledLimit) [[unlikely]] {
    return from_system(size);
  }
  const unsigned index = class_of(size);
  FreeBlock* block = free_lists[index];
  if (block == nullptr) [[unlikely]] {
    return carve(index);
  }
  free_lists[index] = block->next;
  return block;
}

void release(void* block) {
  if (block == nullptr) {
    return;
  }
  Header* header = header_of(block);
  FreeBlock** home = header->home;
  if (home == nullptr) [[unlikely]] {
    std::free(header);
    return;
  }
  auto* freed = static_cast<FreeBlock*>(block);
  freed->next = *home;
  *home = freed;
}

int size_of(void* block) {
  return block == nullptr ? 0 : header_of(block)->size;
}

void* reallocate(void* block, int bytes) {
  Header* header = header_of(block);
  const auto size = static_cast<unsigned>(bytes);
  if (header->home == nullptr && size > kPooledLimit) {
    header = static_cast<Header*>(std::realloc(header, sizeof(Header) + size));
    if (header == nullptr) {
      return nullptr;
    }
    header->size = bytes;
    return header + 1;
  }
  if (header->home != nullptr && bytes <= header->size) {
    return block;
  }
  void* moved = allocate(bytes);
  if (moved != nullptr) {
    std::memcpy(moved, block, static_cast<std::size_t>(std::min(bytes, header->size)));
    release(block);
  }
  return moved;
}

int round_up(int bytes) {
  const auto size = static_cast<unsigned>(bytes);
  return size > kPooledLimit || size == 0 ? (bytes + 7) & ~7
                                          : static_cast<int>(class_size(class_of(size)));
}

int start(void* /*unused*/) {
  return SQLITE_OK;
}
void stop(void* /*unused*/) {}

}  // namespace

const sqlite3_mem_methods sqlite_memory = {allocate, release, reallocate, size_of,
                                           round_up, start,   stop,       nullptr};

}  // namespace host
