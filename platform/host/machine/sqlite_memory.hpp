// SQLite's memory.
#ifndef VORN_HOST_SQLITE_MEMORY_HPP
#define VORN_HOST_SQLITE_MEMORY_HPP

#include <sqlite3.h>

namespace host {

// An allocator of segregated free lists without locks, for SQLITE_CONFIG_MALLOC. Each thread has
// lists of its own; a block may be freed by another thread than took it.
//
// Preparing and running one INSERT takes about forty small blocks. Where SQLite is built without
// lookaside memory (as Debian's is), each of them is a malloc and a free, and with one statement
// per file that is a sixth of the time of gathering. Here both are a few instructions.
//
// Blocks up to 16 KiB come from slabs and go back to a list of their size class, never to the
// system; so the surplus is bounded by what SQLite has in use of such blocks at its peak, thread by
// thread: its page caches and statements, a few MiB. The lists of a thread that ended go to the
// next one that begins. Larger blocks go straight to malloc.
extern const sqlite3_mem_methods sqlite_memory;

}  // namespace host

#endif
