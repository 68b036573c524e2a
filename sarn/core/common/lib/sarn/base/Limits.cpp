#include "sarn/base/Limits.h"

namespace sarn {

const char kJsonDepthLimitFormat[] = "JSON nesting exceeds the depth limit of %d levels.";
const char kDictionaryDepthLimitFormat[] = "Dictionary nesting exceeds the depth limit of %d levels.";
const char kLazyDictDepthLimitFormat[] = "Lazy payload nesting exceeds the depth limit of %d levels.";
const char kJsonArrayLimitMessage[] = "JSON array holds more than 65535 elements.";
const char kJsonRepeatedKeyLimitMessage[] = "JSON object repeats a key more than 65535 times.";
const char kJsonObjectCountLimitMessage[] = "JSON text holds more than 65535 objects.";
const char kRpcHeaderLineLimitMessage[] = "Kerno Rpc frame holds more than 65535 header lines.";
const char kOutOfMemoryMessage[] = "Out of memory.";

}  // namespace sarn
