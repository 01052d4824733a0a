// Databases that outlive a run (SQLite).
#ifndef VORN_DATABASE_H
#define VORN_DATABASE_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef struct VORNDB VORNDB;
typedef struct VORNDBResult VORNDBResult;
typedef struct VORNDBRow VORNDBRow;

// Opens the database `path` into `*db`, making it (mode 0640 before the umask) from the SQL of the
// file `schema_path` when it is missing or empty, in one transaction: another process sees all
// tables or none. Follows no link in the last component. Another process's lock is waited for, ten
// seconds at most, here and by every statement. 0; -1 with `*db` null and one syslog line.
int VornQazDBOpen(VORNDB** db, const char* path, const char* schema_path);
// Closes `*db` and makes it null. 0 or -1.
int VornQazDBClose(VORNDB** db);

// Runs one statement. 0, with `*result` the rows, all of them read, so that no lock is left (null
// when the statement gives none, which a caller needn't free); -1 on failure, with one syslog
// line. `sql` that holds a second statement fails as a whole. `result` may be null.
int VORNDBExecute(VORNDB* db, const char* sql, VORNDBResult** result);
// Goes to the next row. 0, or -1 after the last one.
int VORNDBFetchRow(VORNDBResult* result, VORNDBRow** row);
// The named column of the current row as text, valid until the result is freed; "" for SQL's NULL;
// null when there is no such column.
const char* VORNDBFetchField(VORNDBResult* result, VORNDBRow* row, const char* column);
// Accepts null.
void VORNDBFreeResult(VORNDBResult* result);

// Writes the first `length` bytes of `in` into `out`, escaped for the inside of a single-quoted SQL
// literal. Non-zero on success; 0, with `out` empty, when it doesn't fit, holds a zero byte or an
// argument is null.
int VORNDBEscapeStringEX(VORNDB* db, char* out, size_t size, const char* in, size_t length);

#ifdef __cplusplus
}
#endif

#endif
