// Collection for the whole server, under the profile name "global".
#pragma once

#include "vorn/text.h"

extern "C" {

// Stores a sample of every volume's usage for the profile "global". 0 or -1.
int VornQazGlobalCollectData(const VLIBCSzHash* profile_hash);
}
