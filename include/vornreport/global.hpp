// Collection for the whole server, under the profile name "global".
#pragma once

#include "vorn/text.h"

extern "C" {

// Runs every collect function of the registry for the profile "global". Their last failure, else
// 0; -1 for a null hash.
int VornQazGlobalCollectData(const VLIBCSzHash* profile_hash);
}
