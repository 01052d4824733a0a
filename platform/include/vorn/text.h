// Text containers, shell quoting and the error code of the platform's C library.
//
// Texts are NUL-terminated bytes; nothing here assumes an encoding. The containers copy what they
// are given, and what they hand out stays theirs: it is valid until the entry changes or the
// container is freed.
#ifndef VORN_TEXT_H
#define VORN_TEXT_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

// A hash from text to text.
typedef struct VLIBCSzHash VLIBCSzHash;

// `slots` is the number of entries to make room for; the hash grows past it. Null when out of
// memory. The caller frees it.
VLIBCSzHash* VLIBCSzHashAlloc(size_t slots);
// Accepts null.
void VLIBCSzHashFree(VLIBCSzHash* hash);
// The value of `key`, or null when it is absent or an argument is null.
const char* VLIBCSzHashGetValue(const VLIBCSzHash* hash, const char* key);
// Adds or replaces one entry. Takes the address of the hash because a platform may move it.
// 0, or -1 for a null argument.
int VLIBCSzHashSetValue(VLIBCSzHash** hash, const char* key, const char* value);

// A list of texts in the order of their adding.
typedef struct VLIBCSzList VLIBCSzList;

// As VLIBCSzHashAlloc.
VLIBCSzList* VLIBCSzListAlloc(size_t slots);
// Accepts null.
void VLIBCSzListFree(VLIBCSzList* list);
// 0, or -1 for a null argument.
int VLIBCSzListPush(VLIBCSzList** list, const char* text);
// The number of entries; 0 for null.
int VLIBCSzListCount(const VLIBCSzList* list);
// Entry `index`, counted from 0; null when there is none.
const char* VLIBCSzListGet(const VLIBCSzList* list, int index);

// Appends the pieces of `text` between any of the bytes in `separators` to `*list`, blanks around
// them dropped; empty pieces are kept as empty entries, but a text without any piece adds nothing.
// The number of pieces, or -1 for a null argument.
int VLIBCStrTok(const char* text, const char* separators, VLIBCSzList** list);

// Writes `text` quoted as one word of a POSIX shell command into `out` (`size` bytes, terminator
// included): in single quotes, a single quote inside as '\''. Returns the length written, or -1
// for a null argument or when it doesn't fit (`out` is then the empty text).
int VLIBCEncShParam(const char* text, char* out, size_t size);

// Creates `path` as an empty file of mode 0600 when it is missing; an existing file is left alone.
// Doesn't follow a link in the last component. 0, or -1 with errno.
int VLIBCFileTouch(const char* path);

// The code of the last platform failure of this process; 0 before the first.
int VLIBCErrGet(void);
// Records a failure code and where it was seen; `file` must outlive the process.
void VLIBCErrSetEx(int code, const char* file, int line);

// Codes that the platform itself records.
enum {
  VLIBC_ERR_BAD_PARAMETER = 0x0D00,
  VLIBC_ERR_NO_SECTION = 0x0D01,
  VLIBC_ERR_MALFORMED_FILE = 0x0D02,
  VLIBC_ERR_FILE_IO = 0x0D03,
  VLIBC_ERR_LOCK_BUSY = 0x0D04,
};

#ifdef __cplusplus
}
#endif

#endif
