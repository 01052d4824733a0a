// When a report page counts as finished.
#ifndef VORN_HOST_PAGE_HPP
#define VORN_HOST_PAGE_HPP

#include <string_view>

namespace host {

// Whether `path` is a regular file (no link) that has every part of a page, in order: document
// type, head, language, facts, body, a section for each report that `report_list` selects, end. It
// is asked about the page that a run has just made; a call of the template script that was killed
// leaves a hole that beginning and end don't show.
bool page_is_whole(const char* path, std::string_view report_list);

// Whether it begins with the document type, "<!DOCTYPE html>" in any case, and its last line is
// "</html>". Enough for one that has been found whole at the end of its run.
bool page_is_complete(const char* path);
// The same for `name` in the open folder `folder`.
bool page_is_complete_at(int folder, const char* name);

}  // namespace host

#endif
