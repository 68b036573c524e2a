// The library's version.
#pragma once

#include "sarn/base/Export.h"

namespace sarn {
// "major.minor.patch" of the library that is loaded (not of the headers compiled against).
SARN_EXPORT const char* GetLibraryVersion();
}  // namespace sarn
