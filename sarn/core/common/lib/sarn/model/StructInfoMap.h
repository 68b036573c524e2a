// StructInfoMap: finds a schema type's StructInfo by its schema name ("address"), the "type" value
// of the text forms.
//
// The table it reads, Schema::structNameHashTableG, is built by the generator and never changes:
// a name's home slot is (h mod structNameHashTableSizeG) with h = h * 31 + byte over the name's
// bytes in unsigned 32-bit arithmetic, and a collision moves on to the next slot, wrapping at the
// end. The table always keeps empty slots, so a search ends.
//
// Thread safety: reads constant data only; callable from any thread. Nothing allocates.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"
#include "sarn/model/Schema.h"

namespace sarn {

class SARN_EXPORT StructInfoMap {
 public:
  // The type whose pName equals `name` (byte for byte), or null (also for null and "").
  static const StructInfo* LookupStructByName(const char* name);
  // The home slot of `name` in a table of `tableSize` slots (shared with the generator's tests).
  static uint32_t HomeSlot(const char* name, uint32_t tableSize);
};

}  // namespace sarn
