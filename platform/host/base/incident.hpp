// What the platform notices that a reader of the report must know.
#ifndef VORN_HOST_INCIDENT_HPP
#define VORN_HOST_INCIDENT_HPP

#include <string>

namespace host {

// Hands an incident to whoever VornQazSetIncidentSink has named; what the texts are, see there.
// errno stays.
void tell_incident(const char* kind, const std::string& what, const std::string& text);

}  // namespace host

#endif
