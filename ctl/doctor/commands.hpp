// The command that checks what runs need.
#ifndef VORN_CTL_DOCTOR_COMMANDS_HPP
#define VORN_CTL_DOCTOR_COMMANDS_HPP

#include <CLI/App.hpp>

namespace ctl {

void add_doctor_command(CLI::App& app);

}  // namespace ctl

#endif
