// Sectioned configuration files.
//
// Format, line by line: blank lines; comment lines, whose first character after any indent is '#'
// or ';'; section headers "[name]"; and "key = value" lines with any indent, which belong to the
// section above them. Key and value lose the blanks around them. A value may be empty and may
// contain '='; there is no quoting and no line continuation. Files are UTF-8; a byte order mark at
// the start and carriage returns at line ends are tolerated.
#ifndef VORN_CONFIG_H
#define VORN_CONFIG_H

#include "vorn/text.h"

#ifdef __cplusplus
extern "C" {
#endif

// Reads section `section` of `file` into `*hash`, on top of what is already there.
// Returns the number of its keys; 0 when it is empty; -1 when the file can't be read, the section
// is missing, or a line between its header and the next header is malformed (a key twice counts as
// malformed, so does a second section of this name). An unreadable or malformed file is one syslog
// line with file, line and reason; a missing section is not. `*hash` is unchanged on failure.
int VLIBCFileGetSection(const char* file, const char* section, VLIBCSzHash** hash);

// Rewrites section `section` of `file` so that it holds exactly the entries of `hash`. When `hash`
// was read from this section, what it has changed since is applied to the section as it is now:
// what somebody else has changed in between stays. Keys that stay keep their place, keys that
// `hash` lacks lose their line, new ones follow the last key of the section in sorted order; each
// is written with `line_format`, which holds "%s" twice (key, value) and ends in "\n". Every other
// byte of the file is kept, comments inside the section included. The file is replaced atomically
// (temporary file beside it, fsync, rename, same owner and mode) under a lock against a second
// writer, for which it waits at most ten seconds. `new_name` must be null (a platform may rename
// the section with it; this one doesn't). 0; -1 on failure with nothing changed, one syslog line
// that says why, and VLIBCErrGet set.
int VLIBCFileSetSection(const char* file, const char* section, const char* new_name,
                        const VLIBCSzHash* hash, const char* line_format);

// Appends the names of all sections to `*list`, in file order. Returns their number or -1 (one
// syslog line) when the file can't be read.
int VLIBCFileEnumSection(const char* file, VLIBCSzList** list);

#ifdef __cplusplus
}
#endif

#endif
