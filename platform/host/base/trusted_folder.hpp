// Folders in which nobody but root decides what stands.
#ifndef VORN_HOST_TRUSTED_FOLDER_HPP
#define VORN_HOST_TRUSTED_FOLDER_HPP

#include <string>

#include "vorn/base/file_io.hpp"

namespace host {

// What becomes of folders on the way that aren't there.
enum class Missing {
  refused,  // the answer is ENOENT
  made      // for this user alone and the readers of its group (mode 0750)
};

// What becomes of a folder on the way, or the last one, in which others have a say.
enum class Strangers {
  refused,
  // It is entered, and from there on no link is followed: whatever they do, the way ends in a
  // folder that they could have written to themselves. For a file that is theirs to read.
  not_followed
};

struct TrustedFolder {
  Fd folder;            // open for reading; none when it isn't there or can't be trusted
  std::string problem;  // then, as a sentence with a remedy; empty when it is only missing
};

// Opens the folder `path` (absolute) by handles from the root on. Whoever may rename a folder on
// the way, or write into it, could put a link in its place and lead a program that runs as root
// anywhere. So each must belong to root (or to this process's user) and be writable by nobody else;
// above the last one a sticky folder is fine, in which others can't rename what isn't theirs. (The
// group's bits of a folder with an access control list are the most that the list gives to anybody,
// so the mode tells for both.) Links are followed where root made them, but not in the last place.
// errno says why there is no folder: ENOENT when it is only missing, EPERM when it isn't to be
// trusted.
TrustedFolder open_trusted(const std::string& path, Missing missing,
                           Strangers strangers = Strangers::refused);

}  // namespace host

#endif
