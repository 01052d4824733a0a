// What the server is called and where it is.
#ifndef VORN_HOST_SERVER_HPP
#define VORN_HOST_SERVER_HPP

#include <string>

namespace host {

// The time zone that the link `localtime` leads to, or that the first line of `timezone` names;
// the present distance from UTC ("+02:00") when neither is a plain name. The page's template script
// finds it alike.
std::string time_zone_of(const char* localtime, const char* timezone);

}  // namespace host

#endif
