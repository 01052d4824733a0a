// When a report page counts as finished.
#ifndef VORN_HOST_PAGE_HPP
#define VORN_HOST_PAGE_HPP

namespace host {

// Whether `path` is a regular file (no link) that begins with the document type, "<!DOCTYPE html>"
// in any case, and whose last line is "</html>". The template script writes the one first and the
// other last, so a page that lacks either has lost a part.
bool page_is_complete(const char* path);
// The same for `name` in the open folder `folder`.
bool page_is_complete_at(int folder, const char* name);

}  // namespace host

#endif
