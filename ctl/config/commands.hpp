// The commands that read and change the configuration.
#ifndef VORN_CTL_CONFIG_COMMANDS_HPP
#define VORN_CTL_CONFIG_COMMANDS_HPP

#include <CLI/App.hpp>
#include <string>
#include <vector>

namespace ctl {

void add_share_commands(CLI::App& app);
void add_profile_commands(CLI::App& app);

// Adds "copy" and "rename" to the group `profile`.
void add_profile_moves(CLI::App& profile);

// Adds "test-mail" to the group `profile`.
void add_test_mail_command(CLI::App& profile);

// Prints what can stand in the place of the last of `words`, those behind the program's name; for
// the shells' completion.
void complete(const CLI::App& app, std::vector<std::string> words);

}  // namespace ctl

#endif
