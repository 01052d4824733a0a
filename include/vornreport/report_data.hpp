// The report data file, "/tmp/vornreport_data.<pid>": the growing page that every report appends
// one block to. And the one fact about a run that outlives the report that saw it: whether data was
// lost on the way to the page.
#pragma once

#include <cstdint>
#include <cstdio>

#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {

// The data file's path for this process.
PathText report_data_path();

// What a file that can't be opened or written costs: the whole run, whose page would lack a part,
// or the one report whose CSV file it is.
enum class Costs : uint8_t { kRun, kReport };

// Opens a file for appending ("a") or writing ("w", "w+") and logs "open file=%s failed" at
// `module` and `line` when that fails. It is opened below its folder's handle, through no link, and
// must be a regular file with one name.
enum class LogForm : uint8_t { kSimple, kNested };
FileHandle open_report_file(const char* path, const char* mode, const char* module, int line,
                            LogForm form = LogForm::kNested, Costs costs = Costs::kRun);

// Closes a file that rows went to. When a write or the close failed (a full disk), logs it and
// returns false. An empty handle is fine.
bool close_report_file(FileHandle file, const char* path, const char* module, int line,
                       Costs costs = Costs::kRun);

// Reports run on after one of them lost data, but a page made from what is left must never look
// complete: the report action asks here before it assembles one. Never reset; a process makes one
// report.
void mark_report_data_lost();
bool report_data_lost();

// Whether a failed SQLite call means that data was lost (full disk, I/O error, no memory, a lock
// that others keep), rather than that one statement was wrong. `result` is the call's result code.
bool is_storage_failure(int result);

}  // namespace vornreport
