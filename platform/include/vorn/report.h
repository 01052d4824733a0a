// Report support: environment, profiles and their paths, run status, formats, publishing.
//
// A profile name is 1 to 64 of A-Z a-z 0-9 . _ - and doesn't begin with a dot. Every call that
// takes one fails for anything else, with one syslog line for each such name in the life of the
// process, and makes no path from it.
#ifndef VORN_REPORT_H
#define VORN_REPORT_H

#include <stddef.h>
#include <stdio.h>

#include "vorn/text.h"

#ifdef __cplusplus
extern "C" {
#endif

// Prepares the process once and then costs nothing: open descriptors 0 to 2, a clean environment
// for children, the C.UTF-8 locale for them, umask 027, SQLite configured for connections that
// belong to one thread each and without memory statistics, and as many file handles as a folder
// tree can be deep. To be called before the first thread begins.
void VornQazSetEnv(void);

// --- Profiles -----------------------------------------------------------------------------------

// Appends every profile name of the configuration ("global" left out) in file order. The number,
// or -1. `flags` must be 0.
int VornQazEnumProfile(VLIBCSzList** list, int flags);

// Takes profile `profile` for this process unless another live process holds it: one atomic
// test-and-take with a lock that the kernel drops when the process dies and that no child inherits.
// 0: it is held by this process now (and the profile held before was released). Non-zero: another
// process holds it, and this one keeps what it held. When the lock itself can't be worked (bad
// name, read-only disk), one syslog line, 0, and VornQazStatusUpdate fails for this profile.
int VornQazProfileRunning(const char* profile);

// Stores the status word of `profile`, atomically: "collect_data", "success" or "fail". Only the
// holder of the profile can.
// This is the end of a report run (VornQazInitRealPath with for_report 1), and the only one: of it
// "success" is stored only when the finished report, page and facts, is complete and on the disk;
// otherwise "fail" is stored, one syslog line says why, and what looked like a report is removed.
// Behind the word the status file tells more (report_format/run_state.hpp).
// That end is told (see vornreport(8), "Who is told"): a failure by mail and on standard error,
// what no mail has told on standard error, everything in the profile's metrics_file. 0 when the
// word was stored; 1 when "fail" was, in place of "success"; -1 when nothing could be. After a
// success the oldest finished reports beyond the profile's key `keep_reports` (a number from 1 on;
// unset: all are kept) are removed, never the one just made.
int VornQazStatusUpdate(const char* profile, const char* status);

// A run of `profile` that was only to collect data has failed: stores, beside its word, that it has
// ended, and tells of it as VornQazStatusUpdate does of a report run. Only for the process that has
// taken the profile.
void VornQazDataFailed(const char* profile);

// Notes a line that the program has written to the system log: a run that fails is told with them.
void VornQazNoteLogLine(const char* line);

// Notes that the mail of the report run in progress reached nobody; its status will tell it.
void VornQazStatusMailFailed(void);

// Notes that the report in progress, finished though it is, is missing from the fleet; its mail and
// its status will tell it.
void VornQazStatusFleetFailed(void);

// Adds to `*hash` the paths that don't depend on a profile: `real_path_base`, `real_path_stat_db`.
// `flags` must be 0. 0 or -1.
int VornQazInitLocation(VLIBCSzHash** hash, int flags);

// Adds every `real_path_*` key of `profile` to `*hash`, which holds the profile's section.
// With `for_report` 1 the caller holds the profile: what a killed run of it left behind is removed,
// the folders are made, and the run's temporary names in /tmp are taken (made anew, empty, mode
// 0600, so that nobody else's file or link can stand there). With 0 nothing on disk changes.
// 0, or -1 with one syslog line; with `for_report` 1 also when share.conf can't be read,
// since the report would be empty and look like a good one.
int VornQazInitRealPath(const char* profile, VLIBCSzHash** hash, int for_report);

// Removes what an unfinished run of `profile` left: its `.partial` folders, its statistics database
// with journal, its progress, and this process's temporary names in /tmp. Never a finished report,
// and nothing while another live process holds the profile. `hash` is the profile with its paths;
// null when loading it failed, then only what needs no configuration is removed. Declares nothing:
// the status stays what it is. 0 or -1.
int VornQazReportCleanTmp(const char* profile, const VLIBCSzHash* hash);

// Puts `text` in the place of what VORN_PATH_PROGRESS tells of the run of `profile`: atomically, so
// that a reader never sees a part. Nothing waits for the disk. 0, or -1 without any message: a run
// goes on without.
int VornQazProgressUpdate(const char* profile, const char* text);
// Removes it; a missing one is fine.
void VornQazProgressEnd(const char* profile);

// Removes the schedule whose identifier is the value of `key` in `*hash` (its file in
// VORN_PATH_CRON), and the key. One syslog line for each other job or timer that runs the profile:
// those stay. 1 when `*hash` changed, 0 when there was nothing to do, -1 on failure with one syslog
// line.
int VornQazScheduleClean(const char* profile, VLIBCSzHash** hash, const char* key);

// Copies the profile's language code (key `language`, default "en") into `code`. 1 to 7 letters,
// digits and '-' pass, at most `size` - 1 bytes and not beginning with '-'; anything else is one
// syslog line and "en", so that no report is lost over it. 0, or -1 for a null argument or a `code`
// that "en" doesn't fit.
int VornQazImportLang(const VLIBCSzHash* hash, char* code, size_t size);

// Non-zero when the profile selects `share`: its key `share_list` (names separated by commas) is
// unset or names it.
int VornQazMatchShare(const VLIBCSzHash* hash, const char* share);

// --- The server ---------------------------------------------------------------------------------

// Its name and its time zone ("Europe/Berlin", or "+02:00" where the zone has no name). The length,
// or -1 when it doesn't fit or an argument is null.
int VornQazGetHostName(char* out, size_t size);
int VornQazGetTimeZone(char* out, size_t size);

// From now on the platform calls `sink` for what it notices that a reader of the report must know,
// besides its syslog line: a kind of report_format's table of incidents, what it concerns, and a
// sentence that says what is wrong and what to do. The same may come more than once, and names in
// the texts may be any bytes. Null: nobody is told.
typedef void (*VornIncidentSink)(const char* kind, const char* what, const char* text);
void VornQazSetIncidentSink(VornIncidentSink sink);

// --- What reports look things up in -------------------------------------------------------------

// Makes `*hash` (freed by the caller): every account name that the name service can resolve, asked
// for at look-up and cached. 0, or -1 with `*hash` null.
int VornQazInitFilterUser(VLIBCSzHash** hash);
// Fills `*hash` with share name to folder, for every usable share. The number, or -1.
int VornQazGetSharePathHash(VLIBCSzHash** hash);
// Fills `*hash` with file name extension (without dot) to type label ("reportUI_file_type_image");
// look-ups in it ignore ASCII case from then on. The number of extensions, or -1.
int VornQazInitFileTypeHash(VLIBCSzHash** hash);

// --- Formats ------------------------------------------------------------------------------------
// Each writes a NUL-terminated text into `out` (`size` bytes) and returns its length, or -1 when
// it doesn't fit or an argument is null (`out` is then the empty text).
//
// Of a text that is too long for `out`, VornQazEscChar and VornQazFormatCsvString write what there
// is room for, between whole characters and escapes, then "…" and 16 hexadecimal digits that stand
// for the whole text: nobody hides a file by its name, and two such names stay two. They fail only
// where `out` hasn't room for mark and digits: 20 bytes, or 100 for a `quote` that is a digit
// itself.

// `text` for the inside of a JavaScript string quoted with `quote`. Besides `quote`, everything
// that could leave the string or a script element is escaped: backslash, line ends, '<', U+2028/9,
// control characters, bidirectional controls. A byte that is no UTF-8 becomes the lone surrogate
// \udcXX (as in PEP 383), which a page can tell from every real character.
int VornQazEscChar(const char* text, char* out, size_t size, char quote);
// `text` for the inside of a double-quoted CSV field: quotes doubled, line ends and tabs as
// spaces, and an apostrophe before a text that a spreadsheet would run as a formula.
int VornQazFormatCsvString(const char* text, char* out, size_t size);
// Decimal seconds since the epoch as local time, YYYY-MM-DD HH:MM:SS. Fails for anything else.
int VornQazTimeConvert(const char* seconds, char* out, size_t size);

// The current time as decimal seconds since the epoch.
int VornQazGetTimeSecond(char* out, size_t size);

// Writes a digest of the first `size` bytes of the file `path` into `digest`, as 32 hexadecimal
// digits without terminator (`digest_size` must be 32). Files of one size have equal digests when
// their contents are equal, whatever holes they have. It is the content's MD5, but not where an
// aligned MiB (2^20 bytes) holds nothing but zeros: such are left out and counted, so that holes
// cost nothing. It tells copies apart and isn't made to be shown.
// Follows no link in the last component, with one exception: "/proc/self/fd/" and a number names
// what that descriptor of the caller's holds, which may be an O_PATH handle. The access time stays
// where the system lets it.
// 0; 2 when the file vanished, may not be read, is no regular file any more, has another size or
// changes while it is read, an expected outcome on a server in use, with errno EWOULDBLOCK when a
// client has it leased for the moment; also 2 when the deadline passes before the end; -1 for any
// other failure. Several threads may compute digests at once.
int VornQazGetFileMd5(const char* path, unsigned long long size, char* digest, size_t digest_size);

// Digests end `seconds` from now, whatever happens to the clock: a computation that goes on then is
// broken off, and no other begins. 0: there is no such deadline any more, as at the start. Not to
// be called while a digest is computed.
void VornQazSetDigestDeadline(unsigned long long seconds);
// Non-zero once the deadline has passed. For any thread.
int VornQazDigestDeadlinePassed(void);

// From now on every thread that computes a digest calls `step` after each part of at most a MiB,
// with the bytes that it has read of the file since the last time. It may wait there. Null: no
// longer, as at the start. Not to be called while a digest is computed.
void VornQazSetDigestStep(void (*step)(unsigned long long bytes));

// Finishes a CSV file: puts a UTF-8 byte order mark before it unless it has one. Atomic; harmless
// when repeated. 0 or -1.
int VornQazCsvFile(const char* path);

// Writes the variable `vornSharePath` (share name to folder) to `data` as a script block of its
// own, once in the life of the process, and flushes it; later calls do nothing. 0, or -1 when the
// write failed.
int VornQazImportSharePathHash(const VLIBCSzHash* share_path_hash, FILE* data);

// --- Publishing ---------------------------------------------------------------------------------

// Writes the link to `target_file` into `link`: the profile's `link_base` (default "file://" and
// `report_dir`) and the rest of the path, percent-encoded. Only for a complete page. 0 or -1.
int VornGetTargetLink(const VLIBCSzHash* hash, const char* target_file, char* link, size_t size);

// Sends the profile's mail with `link` to the recipients in `mail_to` through `smtp_url`; it tells
// of a run before this one that didn't finish or never began, too. Waits are
// bounded. 0 when no mail is wanted or at least one recipient was served (each refused one is a
// syslog line); -1, with one syslog line, when nobody was.
int VornQazSendReport(const char* profile, const char* link, const VLIBCSzHash* hash);

#ifdef __cplusplus
}
#endif

#endif
