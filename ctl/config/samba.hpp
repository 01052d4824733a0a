// The shares that Samba offers.
#ifndef VORN_CTL_SAMBA_HPP
#define VORN_CTL_SAMBA_HPP

#include <string>
#include <vector>

namespace ctl {

struct SambaShare {
  std::string name;
  std::string path;
  std::string skipped;   // why it is none to report on ("it is a printer"); empty when it is one
  bool of_user = false;  // made by a user, who can lead it anywhere; else by an administrator
};

// The shares of smb.conf as testparm reads it, then those that users have made, in Samba's order
// and without [global]. Throws a Failure when Samba's configuration can't be read.
std::vector<SambaShare> samba_shares();

}  // namespace ctl

#endif
