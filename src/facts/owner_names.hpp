// Who owns what gathering has counted.
#pragma once

#include "vorn/text.h"

namespace vornreport {

// Notes the names of those who own files, as far as they may be told: accounts of `users` that the
// profile doesn't leave out. Once a run; later calls do nothing.
void note_owner_names(const VLIBCSzHash* users);

}  // namespace vornreport
