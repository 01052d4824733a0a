#include "machine/sqlite_memory.hpp"

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <mutex>

namespace host {
namespace {

// Size classes: 16 of 64 bytes' step up to 1 KiB, then four for each doubling up to 4 KiB. Pages of
// the statistics database are larger: a sort that merges has hundreds, which it should give back.
constexpr unsigned kSmallStepBits = 6;
constexpr unsigned kSmallLimit = 1024;
constexpr unsigned kSmallClasses = kSmallLimit >> kSmallStepBits;
constexpr unsigned kPooledLimit = 4 * 1024;
constexpr unsigned kClassCount = kSmallClasses + 4 * 2;
constexpr std::size_t kSlabSize = std::size_t{128} * 1024;

// A free block holds the link where a used one holds the caller's bytes.
struct FreeBlock {
  FreeBlock* next;
};

// Stands before every block. `list` is the index of the list that a block of a slab goes to when it
// is freed, whichever thread frees it; kOfSystem for one of malloc.
constexpr std::int32_t kOfSystem = -1;
struct alignas(16) Header {
  std::int32_t list;
  std::int32_t size;
};
static_assert(sizeof(Header) == 16);

// What a thread takes blocks from and gives them to. Never freed, as blocks of its slabs may be in
// use by other threads: a thread that ends leaves it to the next one that begins.
struct Pool {
  std::array<FreeBlock*, kClassCount> free_lists;
  std::byte* slab_next;
  std::byte* slab_end;
  Pool* next;  // of those that no thread has
};

std::mutex idle_pools_mutex;
Pool* idle_pools = nullptr;

// Without a destructor and found without a call, since every block asks for it.
[[gnu::tls_model("initial-exec")]] constinit thread_local Pool* own_pool = nullptr;

struct LeavePool {
  ~LeavePool() {
    const std::lock_guard lock(idle_pools_mutex);
    own_pool->next = idle_pools;
    idle_pools = own_pool;
    own_pool = nullptr;
  }
};

// Null when there is no memory.
[[gnu::noinline]] Pool* take_pool() {
  {
    const std::lock_guard lock(idle_pools_mutex);
    if (idle_pools != nullptr) {
      own_pool = idle_pools;
      idle_pools = own_pool->next;
    }
  }
  if (own_pool == nullptr) {
    own_pool = static_cast<Pool*>(std::calloc(1, sizeof(Pool)));
  }
  if (own_pool != nullptr) {
    static thread_local const LeavePool leave_at_end;
  }
  return own_pool;
}

Pool* pool() {
  Pool* const own = own_pool;
  return own != nullptr ? own : take_pool();
}

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
static_assert(class_size(class_of(1025)) == 1280 && class_size(class_of(3600)) == 4096);
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
  *header = {kOfSystem, static_cast<std::int32_t>(size)};
  return header + 1;
}

// What is left of the old slab, less than one block of this class, is given up.
[[gnu::noinline]] void* carve(Pool& own, unsigned index) {
  const unsigned size = class_size(index);
  const std::size_t needed = sizeof(Header) + size;
  if (static_cast<std::size_t>(own.slab_end - own.slab_next) < needed) {
    auto* slab = static_cast<std::byte*>(std::malloc(kSlabSize));
    if (slab == nullptr) {
      return nullptr;
    }
    own.slab_next = slab;
    own.slab_end = slab + kSlabSize;
  }
  auto* header = reinterpret_cast<Header*>(own.slab_next);
  own.slab_next += needed;
  *header = {static_cast<std::int32_t>(index), static_cast<std::int32_t>(size)};
  return header + 1;
}

// SQLite asks for at least one byte and never for 2 GiB or more.
void* allocate(int bytes) {
  const auto size = static_cast<unsigned>(bytes);
  if (size > kPooledLimit) [[unlikely]] {
    return from_system(size);
  }
  Pool* const own = pool();
  if (own == nullptr) [[unlikely]] {
    return nullptr;
  }
  const unsigned index = class_of(size);
  FreeBlock* block = own->free_lists[index];
  if (block == nullptr) [[unlikely]] {
    return carve(*own, index);
  }
  own->free_lists[index] = block->next;
  return block;
}

void release(void* block) {
  if (block == nullptr) {
    return;
  }
  Header* header = header_of(block);
  if (header->list == kOfSystem) [[unlikely]] {
    std::free(header);
    return;
  }
  Pool* const own = pool();
  if (own == nullptr) [[unlikely]] {
    return;  // lost; there is no memory for more than this block either
  }
  FreeBlock*& list = own->free_lists[static_cast<unsigned>(header->list)];
  auto* freed = static_cast<FreeBlock*>(block);
  freed->next = list;
  list = freed;
}

int size_of(void* block) {
  return block == nullptr ? 0 : header_of(block)->size;
}

void* reallocate(void* block, int bytes) {
  Header* header = header_of(block);
  const auto size = static_cast<unsigned>(bytes);
  if (header->list == kOfSystem && size > kPooledLimit) {
    header = static_cast<Header*>(std::realloc(header, sizeof(Header) + size));
    if (header == nullptr) {
      return nullptr;
    }
    header->size = bytes;
    return header + 1;
  }
  if (header->list != kOfSystem && bytes <= header->size) {
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
