// The field-access layer: how every walker (JSON, Dictionary and binary writers and readers,
// equality, copy) reaches the values of one field of a schema object through its FieldInfo, and
// what it needs to know about each data type, so that no walker reads a generated class or keeps
// a table of its own.
//
// Per data type there is one row of DataTypeTraits (how a value is stored, its width, whether it
// holds schema objects, whether it has a text form, whether JSON quotes it, its wire type). A
// field is seen as a list of values: a single (optional or required) field is one value at index
// 0; a multi-valued field is its platform array. Each value is stored in one of three forms:
//   scalar     1, 4 or 8 bytes in place, arrays are VekGenericIntArray;
//   string     a VekString (STRING, STRING_ID), arrays are VekStringArray;
//   reference  a counted pointer to a VekCore (BYTESTRING, ANY_DICT, KNOWN_DICT, SUBDICT,
//              KNOWN_DICT_AS_LAZY), arrays are VekGenericArray.
// The Put* operations store into a single field or append to a multi-valued one, by the record's
// arity, so a reader converts a value once and lets the record decide where it goes. Presence of
// optional fields is read and set here too (IsFieldPresent, MarkFieldPresent).
//
// Ownership: reading hands out pointers into the object (valid while the object is unchanged);
// PutReference takes its own reference on the stored object and releases the one it replaces.
//
// Thread safety: none; the object belongs to one thread while it is written.
#pragma once

#include <cstdint>
#include <cstring>

#include "sarn/base/Export.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "vek/VekArray.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace sarn {

// What every walker needs to know about one data type.
struct DataTypeTraits {
  enum Storage : uint8_t {
    STORAGE_SCALAR = 0,
    STORAGE_STRING = 1,
    STORAGE_REFERENCE = 2,
    STORAGE_NONE = 3,  // data type codes outside 0..20
  };
  uint8_t dataType;       // the row's own code, checked against its index below
  Storage storage;
  uint8_t width;          // bytes of one scalar value (1, 4 or 8); 0 for the other forms
  bool isHoldingObjects;  // a value is (or, for a lazy payload, may hold) a schema object
  bool isWithText;        // a value has a text form of its own (all but dictionaries and objects)
  bool isQuotedInJson;    // that text is a JSON string (BOOL, S32 and U32 travel bare)
  uint8_t wireType;       // protocol-buffer wire type: 0 varint, 1 eight bytes, 2 length-delimited

  // A null reference of this type is no value at all and is left out by every writer. A null
  // byte string is not: it has a text form (the empty one).
  constexpr bool IsNullAbsent() const { return storage == STORAGE_REFERENCE && !isWithText; }
};

namespace internal {

constexpr DataTypeTraits::Storage kScalar = DataTypeTraits::STORAGE_SCALAR;
constexpr DataTypeTraits::Storage kString = DataTypeTraits::STORAGE_STRING;
constexpr DataTypeTraits::Storage kReference = DataTypeTraits::STORAGE_REFERENCE;

// Columns: code, storage, width, holds objects, has text, quoted in JSON, wire type.
inline constexpr DataTypeTraits kDataTypeTraitsG[] = {
    {SARN_DATA_TYPE_BOOL, kScalar, 1, false, true, false, 0},
    {SARN_DATA_TYPE_BYTESTRING, kReference, 0, false, true, true, 2},
    {SARN_DATA_TYPE_CHANNEL_NUMBER, kScalar, 8, false, true, true, 2},
    {SARN_DATA_TYPE_CURRENCY, kScalar, 8, false, true, true, 2},
    {SARN_DATA_TYPE_DATE, kScalar, 4, false, true, true, 0},
    {SARN_DATA_TYPE_DATETIME, kScalar, 8, false, true, true, 0},
    {SARN_DATA_TYPE_ANY_DICT, kReference, 0, false, false, false, 2},
    {SARN_DATA_TYPE_ENUM, kScalar, 4, false, true, true, 0},
    {SARN_DATA_TYPE_FLOAT, kScalar, 8, false, true, true, 1},
    {SARN_DATA_TYPE_INT_ID, kScalar, 4, false, true, true, 0},
    {SARN_DATA_TYPE_LONG_ID, kScalar, 8, false, true, true, 0},
    {SARN_DATA_TYPE_STRING_ID, kString, 0, false, true, true, 2},
    {SARN_DATA_TYPE_KNOWN_DICT, kReference, 0, true, false, false, 2},
    {SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY, kReference, 0, true, false, false, 2},
    {SARN_DATA_TYPE_SUBDICT, kReference, 0, true, false, false, 2},
    {SARN_DATA_TYPE_S64, kScalar, 8, false, true, true, 0},
    {SARN_DATA_TYPE_S32, kScalar, 4, false, true, false, 0},
    {SARN_DATA_TYPE_STRING, kString, 0, false, true, true, 2},
    {SARN_DATA_TYPE_TIME, kScalar, 4, false, true, true, 0},
    {SARN_DATA_TYPE_U32, kScalar, 4, false, true, false, 0},
    {SARN_DATA_TYPE_U64, kScalar, 8, false, true, true, 0},
};
inline constexpr unsigned kDataTypeCountG = sizeof kDataTypeTraitsG / sizeof kDataTypeTraitsG[0];
// Codes 21..31 (the placeholder's and unused ones): nothing to read, skipped by every walker.
inline constexpr DataTypeTraits kNoDataTypeG = {SARN_DATA_TYPE_PLACEHOLDER, DataTypeTraits::STORAGE_NONE, 0,
                                                false, false, false, 0};

constexpr bool TraitsAreConsistent() {
  for (unsigned code = 0; code < kDataTypeCountG; ++code) {
    const DataTypeTraits& t = kDataTypeTraitsG[code];
    if (t.dataType != code) return false;                          // one row per code, in order
    if ((t.storage == kScalar) != (t.width != 0)) return false;    // only scalars have a width
    if (t.width != 0 && t.width != 1 && t.width != 4 && t.width != 8) return false;
    if (t.isHoldingObjects && (t.storage != kReference || t.isWithText)) return false;
    if (!t.isWithText && t.isQuotedInJson) return false;
    if (t.wireType > 2 || (t.storage != kScalar && t.wireType != 2)) return false;
    if (t.wireType == 1 && t.width != 8) return false;
  }
  return true;
}

}  // namespace internal

static_assert(internal::kDataTypeCountG == SARN_DATA_TYPE_U64 + 1, "one traits row per data type code");
static_assert(internal::TraitsAreConsistent(), "data type traits rows are in code order and agree with each other");

// The row of `dataType`; codes past U64 get a row with storage NONE.
constexpr const DataTypeTraits& TraitsOf(unsigned dataType) {
  return dataType < internal::kDataTypeCountG ? internal::kDataTypeTraitsG[dataType] : internal::kNoDataTypeG;
}

static_assert(TraitsOf(SARN_DATA_TYPE_BOOL).width == 1 && TraitsOf(SARN_DATA_TYPE_ENUM).width == sizeof(uint32_t) &&
                  TraitsOf(SARN_DATA_TYPE_LONG_ID).width == sizeof(uint64_t) &&
                  TraitsOf(SARN_DATA_TYPE_FLOAT).width == sizeof(double),
              "scalar widths are the widths of the stored C++ types");
static_assert(!TraitsOf(SARN_DATA_TYPE_S32).isQuotedInJson && TraitsOf(SARN_DATA_TYPE_S64).isQuotedInJson &&
                  TraitsOf(SARN_DATA_TYPE_STRING).isQuotedInJson,
              "JSON writes 32-bit integers bare and 64-bit ones as strings");
static_assert(TraitsOf(SARN_DATA_TYPE_PLACEHOLDER).storage == DataTypeTraits::STORAGE_NONE, "placeholder has no value");

// Address of the storage of `field` in `object` (a value, a reference, or a platform array).
inline void* FieldStorage(SarnObject* object, const FieldInfo& field) {
  return reinterpret_cast<unsigned char*>(object) + field.valueOffset;
}
inline const void* FieldStorage(const SarnObject* object, const FieldInfo& field) {
  return reinterpret_cast<const unsigned char*>(object) + field.valueOffset;
}
// Typed access to the storage of `field`; T must be the member type the data type and arity give.
template <class T>
inline T& FieldRef(SarnObject* object, const FieldInfo& field) {
  return *static_cast<T*>(FieldStorage(object, field));
}
template <class T>
inline const T& FieldRef(const SarnObject* object, const FieldInfo& field) {
  return *static_cast<const T*>(FieldStorage(object, field));
}

// NONE is never present; REQUIRED and MULTI always are; an OPTIONAL field is present when its
// flag byte is non-zero, or, without a flag byte (the reference kinds), when its reference is
// non-null.
inline bool IsFieldPresent(const SarnObject* object, const FieldInfo& field) {
  switch (field.arity) {
    case SARN_ARITY_NONE:
      return false;
    case SARN_ARITY_OPTIONAL:
      if (field.flagOffset != 0) return reinterpret_cast<const unsigned char*>(object)[field.flagOffset] != 0;
      return FieldRef<const void*>(object, field) != nullptr;
    default:
      return true;
  }
}
// Records that an optional field now holds a value (sets its flag byte when it has one; a
// flagless reference field is present through its non-null reference).
inline void MarkFieldPresent(SarnObject* object, const FieldInfo& field) {
  if (field.flagOffset != 0) reinterpret_cast<unsigned char*>(object)[field.flagOffset] = 1;
}

class SARN_EXPORT FieldAccess {
 public:
  using Storage = DataTypeTraits::Storage;
  static constexpr Storage STORAGE_SCALAR = DataTypeTraits::STORAGE_SCALAR;
  static constexpr Storage STORAGE_STRING = DataTypeTraits::STORAGE_STRING;
  static constexpr Storage STORAGE_REFERENCE = DataTypeTraits::STORAGE_REFERENCE;
  static constexpr Storage STORAGE_NONE = DataTypeTraits::STORAGE_NONE;

  static Storage StorageOf(unsigned dataType) { return TraitsOf(dataType).storage; }
  // Bytes of one scalar value (1, 4 or 8); 0 for the other storage forms.
  static unsigned ScalarWidth(unsigned dataType) { return TraitsOf(dataType).width; }

  // Number of values: the array's count for a multi-valued field, else 1.
  static unsigned Count(const SarnObject* object, const FieldInfo& field) {
    if (field.arity != SARN_ARITY_MULTI) return 1;
    switch (StorageOf(field.dataType)) {
      case STORAGE_SCALAR:
        return FieldRef<VekGenericIntArray>(object, field).Count();
      case STORAGE_STRING:
        return FieldRef<VekStringArray>(object, field).Count();
      case STORAGE_REFERENCE:
        return FieldRef<VekGenericArray>(object, field).Count();
      default:
        return 0;
    }
  }

  // Value `i` (below Count) of a scalar field: ScalarWidth bytes, possibly unaligned in an array.
  static const void* ScalarAt(const SarnObject* object, const FieldInfo& field, unsigned i) {
    if (field.arity != SARN_ARITY_MULTI) return FieldStorage(object, field);
    return FieldRef<VekGenericIntArray>(object, field).Get(static_cast<int>(i));
  }
  // The scalar at `i` copied into a T of the width the data type gives (no alignment assumed).
  template <class T>
  static T ScalarValue(const SarnObject* object, const FieldInfo& field, unsigned i) {
    T value;
    std::memcpy(&value, ScalarAt(object, field, i), sizeof value);
    return value;
  }
  static const VekString& StringAt(const SarnObject* object, const FieldInfo& field, unsigned i) {
    if (field.arity != SARN_ARITY_MULTI) return FieldRef<VekString>(object, field);
    return FieldRef<VekStringArray>(object, field).Get(static_cast<int>(i));
  }
  // The object a reference value points at, or null. Every referenced class derives from VekCore
  // alone, so the stored pointer is the VekCore pointer.
  static VekCore* ReferenceAt(const SarnObject* object, const FieldInfo& field, unsigned i) {
    if (field.arity != SARN_ARITY_MULTI) {
      VekCore* value;
      std::memcpy(&value, FieldStorage(object, field), sizeof value);
      return value;
    }
    return FieldRef<VekGenericArray>(object, field).Get(static_cast<int>(i));
  }

  // Store into a single field, or append to a multi-valued one. False only when an array is full
  // (65,535 elements) or out of memory; nothing changes then.
  // (PutScalar is inline: readers store a scalar per value read.)
  static bool PutScalar(SarnObject* object, const FieldInfo& field, const void* value) {
    if (field.arity == SARN_ARITY_MULTI) return FieldRef<VekGenericIntArray>(object, field).Add(value);
    std::memcpy(FieldStorage(object, field), value, ScalarWidth(field.dataType));
    return true;
  }
  static bool PutString(SarnObject* object, const FieldInfo& field, const VekString& value);
  // The same, taking the string over where it can (a single field): a reader's fresh string is
  // stored without a second reference.
  static bool PutString(SarnObject* object, const FieldInfo& field, VekString&& value);
  static bool PutReference(SarnObject* object, const FieldInfo& field, VekCore* value);
};

}  // namespace sarn
