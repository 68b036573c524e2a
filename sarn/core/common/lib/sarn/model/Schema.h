// Schema metadata and the registry: how every schema type, field and enumeration is described,
// and the rules by which the walkers (JSON, Dictionary, protocol buffers, equality) select fields.
//
// The records are constant data emitted by the schema generator (tools/schemagen) into the build
// tree; the runtime never builds or frees any of them. The byte layout of FieldInfo,
// FieldInfoHistory, StructInfo and EnumDef is shared between the generator's output and every
// walker, so it is fixed and asserted below.
//
// Ownership: everything here is static and lives for the whole program; pointers handed out by the
// rule functions point into those tables and are never freed.
//
// Thread safety: read-only once static initialisation has finished; read from any thread without
// locking. Every lookup is an array read; nothing allocates.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/base/Export.h"

class VekMempool;
template <class T>
class ref;

namespace sarn {

class SarnObject;

// A schema version number. Version 0 means "no version filter".
typedef int KernoVersion;

// Low five bits of FieldInfo::typeBits.
enum SarnDataType {
  SARN_DATA_TYPE_BOOL = 0,
  SARN_DATA_TYPE_BYTESTRING = 1,
  SARN_DATA_TYPE_CHANNEL_NUMBER = 2,
  SARN_DATA_TYPE_CURRENCY = 3,
  SARN_DATA_TYPE_DATE = 4,
  SARN_DATA_TYPE_DATETIME = 5,
  SARN_DATA_TYPE_ANY_DICT = 6,
  SARN_DATA_TYPE_ENUM = 7,
  SARN_DATA_TYPE_FLOAT = 8,
  SARN_DATA_TYPE_INT_ID = 9,
  SARN_DATA_TYPE_LONG_ID = 10,
  SARN_DATA_TYPE_STRING_ID = 11,
  SARN_DATA_TYPE_KNOWN_DICT = 12,
  SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY = 13,
  SARN_DATA_TYPE_SUBDICT = 14,
  SARN_DATA_TYPE_S64 = 15,
  SARN_DATA_TYPE_S32 = 16,
  SARN_DATA_TYPE_STRING = 17,
  SARN_DATA_TYPE_TIME = 18,
  SARN_DATA_TYPE_U32 = 19,
  SARN_DATA_TYPE_U64 = 20,
  // Only in the placeholder record of an unused field number; codes 22..31 never occur.
  SARN_DATA_TYPE_PLACEHOLDER = 21,
};

// Bits 5 and 6 of FieldInfo::typeBits.
enum SarnArity {
  SARN_ARITY_OPTIONAL = 0,
  SARN_ARITY_REQUIRED = 1,
  SARN_ARITY_MULTI = 2,
  SARN_ARITY_NONE = 3,
};

// One field number of one type, twelve bytes. The index of the record in its type's table is the
// field number; nothing in the record stores it.
struct FieldInfo {
  uint8_t minVersion;  // first schema version that carries the field
  uint8_t maxVersion;  // last schema version that carries the field
  union {
    // bits 0-4 data type, bits 5-6 arity, bits 7-15 byte offset of the presence flag (0: none).
    uint16_t typeBits;
    struct {
      uint16_t dataType : 5;
      uint16_t arity : 2;
      uint16_t flagOffset : 9;
    };
  };
  uint16_t valueOffset;  // byte offset of the field's storage in the object
  uint16_t refIndex;     // struct id or enum id the field refers to, else 0
  uint16_t nameOffset;   // offset of the name in the type's name pool
  uint16_t reserved;     // always 0
};
static_assert(sizeof(FieldInfo) == 12, "FieldInfo is twelve bytes");
static_assert(offsetof(FieldInfo, typeBits) == 2 && offsetof(FieldInfo, valueOffset) == 4 &&
                  offsetof(FieldInfo, refIndex) == 6 && offsetof(FieldInfo, nameOffset) == 8,
              "FieldInfo member offsets");

// typeBits of the placeholder record: data type 21, arity NONE, no flag.
constexpr uint16_t kPlaceholderTypeBits = SARN_DATA_TYPE_PLACEHOLDER | (SARN_ARITY_NONE << 5);

// Builds a typeBits value from its three parts.
constexpr uint16_t MakeTypeBits(unsigned dataType, unsigned arity, unsigned flagOffset) {
  return static_cast<uint16_t>((flagOffset << 7) | (arity << 5) | dataType);
}

// Older representations of one field number (parallel to the field table).
struct FieldInfoHistory {
  uint32_t nFieldInfo;           // number of older records; 0 for almost every field
  const FieldInfo* vFieldInfo;   // the older records, or null
};
static_assert(sizeof(FieldInfoHistory) == 16, "FieldInfoHistory layout");

// Creates a default object of one type in `pool` and returns its first reference.
typedef ref<SarnObject> (*SarnObjectFactory)(VekMempool* pool);

// One per schema type (writable data in the generated code).
struct StructInfo {
  const char* pName;                        // schema name, lower camel case ("address")
  const char* pIdPrefix;                    // object-id prefix ("vask:ds."), or null
  uint16_t nFieldInfo;                      // records in the field table = highest field number + 1
  const FieldInfo* vFieldInfo;              // the field table, index = field number
  const FieldInfoHistory* vFieldInfoHistory;  // same length as vFieldInfo
  const char* pFieldNames;                  // the name pool (NUL-terminated names end to end)
  SarnObjectFactory pFactory;               // creates a default object of the type
};
static_assert(sizeof(StructInfo) == 56 && offsetof(StructInfo, vFieldInfo) == 24 &&
                  offsetof(StructInfo, pFactory) == 48,
              "StructInfo layout");

// One per enumeration. Enum numbers are indexes into vName.
struct EnumDef {
  uint64_t nValue;            // highest number + 1
  const char* const* vName;   // nValue entries; null where a number is not a value of the enum
};
static_assert(sizeof(EnumDef) == 16, "EnumDef layout");

// The registry. The tables are filled at build time by the generator; a null slot means that the
// library has no type (or enum) with that id.
class SARN_EXPORT Schema {
 public:
  // Slot i = type with id i; valid for 0 <= i < nStructDefG.
  static const StructInfo* const vStructDefG[];
  static const int nStructDefG;
  // Slot i = enum with id i; valid for 0 <= i < nEnumDefG.
  static const EnumDef* const vEnumDefG[];
  static const int nEnumDefG;
  // Open-addressed table by pName (see StructInfoMap::LookupStructByName).
  static const StructInfo* const structNameHashTableG[];
  static const int structNameHashTableSizeG;
  // Versions the metadata describes, and the one a client uses when it has no other.
  static const int firstSchemaVersionG;
  static const int lastSchemaVersionG;
  static const int defaultSchemaVersionG;
  // Number of types and enums compiled in (filled slots of the two id tables).
  static const int nStructTypeG;
  static const int nEnumTypeG;
};

// The rules every walker shares (presence of optional fields: FieldAccess.h).

// The StructInfo of type id `id`, or null when the id is outside the table or names no type.
SARN_EXPORT const StructInfo* StructInfoForId(long id);
// The EnumDef of enum id `id`, or null.
SARN_EXPORT const EnumDef* EnumDefForId(long id);

// The record takes part at `version` when its arity is not NONE and version is 0 or
// within [minVersion, maxVersion].
inline bool FieldTakesPart(const FieldInfo& field, KernoVersion version) {
  if (field.arity == SARN_ARITY_NONE) return false;
  return version == 0 || (field.minVersion <= version && version <= field.maxVersion);
}

// The record describing field `n` of `info` at `version`: at
// version 0 the current record; otherwise the first older record whose range holds `version`,
// else the current record if its own range holds it. Null when the field does not take part
// (arity NONE, out of range, or n beyond the table).
SARN_EXPORT const FieldInfo* FieldForVersion(const StructInfo* info, unsigned n, KernoVersion version);

// The name of number `number` in enum `enumId`, or null when the enum or the number has
// none. The returned text is the metadata's own constant.
SARN_EXPORT const char* EnumNumberName(long enumId, uint64_t number);
// The reverse: the index of the first non-null name equal to `name`. False (and `number`
// untouched) when there is none.
SARN_EXPORT bool EnumNameNumber(long enumId, const char* name, unsigned int& number);

// The name of `field` in `info`'s name pool (a placeholder has no name of its own: do not ask).
inline const char* FieldName(const StructInfo* info, const FieldInfo& field) {
  return info->pFieldNames + field.nameOffset;
}

}  // namespace sarn
