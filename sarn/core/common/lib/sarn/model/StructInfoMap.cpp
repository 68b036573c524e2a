// Lookup by type name in the generator-built open-addressed table. The hash and the linear probing
// must match the generator's placement exactly, or names would be missed.
#include "sarn/model/StructInfoMap.h"

#include <cstring>

namespace sarn {

uint32_t StructInfoMap::HomeSlot(const char* name, uint32_t tableSize) {
  uint32_t h = 0;
  for (const unsigned char* p = reinterpret_cast<const unsigned char*>(name); *p != 0; ++p) {
    h = h * 31u + *p;
  }
  return h % tableSize;
}

const StructInfo* StructInfoMap::LookupStructByName(const char* name) {
  if (name == nullptr || Schema::structNameHashTableSizeG <= 0) return nullptr;
  const uint32_t size = static_cast<uint32_t>(Schema::structNameHashTableSizeG);
  uint32_t slot = HomeSlot(name, size);
  // The generator leaves empty slots, so the walk meets one; the bound guards a full table.
  for (uint32_t probes = 0; probes < size; ++probes) {
    const StructInfo* info = Schema::structNameHashTableG[slot];
    if (info == nullptr) return nullptr;
    if (std::strcmp(name, info->pName) == 0) return info;
    slot = slot + 1 == size ? 0 : slot + 1;
  }
  return nullptr;
}

}  // namespace sarn
