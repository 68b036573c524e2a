// The shared field-selection rules. The tables themselves are generated (build tree); this file
// only reads them, so every walker applies the same version, history and enum rules.
#include "sarn/model/Schema.h"

#include <cstring>


namespace sarn {

const StructInfo* StructInfoForId(long id) {
  if (id < 0 || id >= Schema::nStructDefG) return nullptr;
  return Schema::vStructDefG[id];
}

const EnumDef* EnumDefForId(long id) {
  if (id < 0 || id >= Schema::nEnumDefG) return nullptr;
  return Schema::vEnumDefG[id];
}

const FieldInfo* FieldForVersion(const StructInfo* info, unsigned n, KernoVersion version) {
  if (info == nullptr || n >= info->nFieldInfo) return nullptr;
  const FieldInfo& current = info->vFieldInfo[n];
  if (current.arity == SARN_ARITY_NONE) return nullptr;
  if (version == 0) return &current;
  // An older record carries the field in an earlier range with its own arity, flag and slot;
  // it wins over the current record for the versions it covers.
  const FieldInfoHistory& history = info->vFieldInfoHistory[n];
  for (uint32_t i = 0; i < history.nFieldInfo; ++i) {
    const FieldInfo& older = history.vFieldInfo[i];
    if (older.minVersion <= version && version <= older.maxVersion) {
      return older.arity == SARN_ARITY_NONE ? nullptr : &older;
    }
  }
  return FieldTakesPart(current, version) ? &current : nullptr;
}

const char* EnumNumberName(long enumId, uint64_t number) {
  const EnumDef* def = EnumDefForId(enumId);
  if (def == nullptr || number >= def->nValue) return nullptr;
  return def->vName[number];
}

bool EnumNameNumber(long enumId, const char* name, unsigned int& number) {
  const EnumDef* def = EnumDefForId(enumId);
  if (def == nullptr || name == nullptr) return false;
  for (uint64_t i = 0; i < def->nValue; ++i) {
    if (def->vName[i] != nullptr && std::strcmp(def->vName[i], name) == 0) {
      number = static_cast<unsigned int>(i);
      return true;
    }
  }
  return false;
}

}  // namespace sarn
