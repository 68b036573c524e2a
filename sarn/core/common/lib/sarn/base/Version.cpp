#include "sarn/base/Version.h"

namespace sarn {
const char* GetLibraryVersion() { return "0.1.0"; }
}  // namespace sarn
