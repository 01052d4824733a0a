// When a report page counts as finished.
#ifndef VORN_HOST_PAGE_HPP
#define VORN_HOST_PAGE_HPP

namespace host {

// Whether `path` is a regular file (no link) whose last line is "</html>": the template script
// writes that line last, so a page that lacks it was cut short.
bool page_is_complete(const char* path);

}  // namespace host

#endif
