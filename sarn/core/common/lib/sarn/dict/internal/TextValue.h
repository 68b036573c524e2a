// Internal: the text values the readers and StringValue::Make of a C text create, each one block
// holding the value and its text (see StringValue in DictValue.h). Not installed.
#pragma once

#include <cstddef>

#include "sarn/dict/DictValue.h"

namespace sarn {
namespace internal {

// A new StringValue in `pool` holding a copy of the `nByte` bytes at `bytes`, with no reference
// yet; null when memory runs out.
StringValue* NewTextValue(VekMempool* pool, const void* bytes, size_t nByte, bool needQuotes);

}  // namespace internal
}  // namespace sarn
