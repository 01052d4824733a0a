#include "base/incident.hpp"

#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace {

VornIncidentSink incident_sink = nullptr;

}  // namespace

void host::tell_incident(const char* kind, const std::string& what, const std::string& text) {
  if (incident_sink != nullptr) {
    const ErrnoKeeper keeper;
    incident_sink(kind, what.c_str(), text.c_str());
  }
}

void VornQazSetIncidentSink(VornIncidentSink sink) {
  incident_sink = sink;
}
