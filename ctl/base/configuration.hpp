// The configuration files as vornctl reads and changes them. Every failure is thrown as a Failure.
#ifndef VORN_CTL_CONFIGURATION_HPP
#define VORN_CTL_CONFIGURATION_HPP

#include <string>
#include <vector>

#include "vorn/admin/configuration.hpp"
#include "vorn/admin/shares.hpp"

namespace ctl {

using admin::Changes;
using admin::Section;
using admin::Share;

// Whether `name` can name a profile; says why not. "global" is no profile.
void check_profile_name(const std::string& name);

// Every profile but "global", in the order of the file. A malformed section is warned of and left
// out.
std::vector<Section> read_profiles();
// One profile; "global" counts here.
Section read_profile(const std::string& name);
bool profile_exists(const std::string& name);

// No run of the profile can begin from here to the end of the process.
void hold_profile(const std::string& profile);

// The usable shares in the order of the file; what is left out is warned of.
std::vector<Share> read_shares();

// Each changes one section of `file`, as admin's function of this name does.
void add_section(const char* file, const std::string& name, const Changes& entries);
void change_section(const char* file, const std::string& name, const Changes& changes,
                    const std::string& new_name = {});
void remove_section(const char* file, const std::string& name);

}  // namespace ctl

#endif
