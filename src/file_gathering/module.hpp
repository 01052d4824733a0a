// Names that the gathering files share.
#pragma once

#include "vorn/text.h"

namespace vornreport {

inline constexpr char kGatheringModule[] = "src/file_gathering";
inline constexpr char kOtherType[] = "reportUI_file_type_other";

// The type label of an extension as written.
inline const char* type_label(const VLIBCSzHash* types, const char* extension) {
  const char* label = VLIBCSzHashGetValue(types, extension);
  return label != nullptr ? label : kOtherType;
}

}  // namespace vornreport
