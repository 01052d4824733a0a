// The folder of a report run that is its process's alone.
#ifndef VORN_HOST_SCRATCH_HPP
#define VORN_HOST_SCRATCH_HPP

#include <string>

namespace host {

// The folder (mode 0700) that holds what the run keeps from everybody else, and that is removed
// with all that is in it at the run's end; empty when this process runs no report.
const std::string& scratch_folder();
void set_scratch_folder(const std::string& folder);

}  // namespace host

#endif
