// The gathering of a run.
#pragma once

#include "vorn/text.h"

namespace vornreport {

// Fills the profile's statistics database from every share that the profile selects: from the
// share's file index where it keeps one, else (or when the import failed) by walking its folders.
// The number of shares walked, or -1 when it could not start.
int file_gathering(const char* profile, const VLIBCSzHash* profile_hash);

}  // namespace vornreport
