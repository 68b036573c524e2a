// FieldAccess: the values of one field of a schema object, read and written through its FieldInfo,
// so that every walker (JSON out, Dictionary out and in, and later ones) shares one way of reaching
// single values and the elements of multi-valued arrays.
//
// A field is seen as a list of values: a single (optional or required) field is one value at index
// 0; a multi-valued field is its platform array. Each value is reached in one of three storage
// forms, chosen by the data type:
//   scalar     1, 4 or 8 bytes in place (BOOL; DATE, TIME, ENUM, INT_ID, S32, U32; CHANNEL_NUMBER,
//              CURRENCY, DATETIME, FLOAT, LONG_ID, S64, U64), arrays are VekGenericIntArray;
//   string     a VekString (STRING, STRING_ID), arrays are VekStringArray;
//   reference  a counted pointer to a VekCore (BYTESTRING, ANY_DICT, KNOWN_DICT, SUBDICT,
//              KNOWN_DICT_AS_LAZY), arrays are VekGenericArray.
// The Put* operations store into a single field or append to a multi-valued one, by the record's
// arity, so a reader converts a value once and lets the record decide where it goes.
//
// Ownership: reading hands out pointers into the object (valid while the object is unchanged);
// PutReference takes its own reference on the stored object and releases the one it replaces.
// Presence flags are not touched here (see MarkFieldPresent and IsFieldPresent in SarnObject.h).
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

class SARN_EXPORT FieldAccess {
 public:
  enum Storage {
    STORAGE_SCALAR = 0,
    STORAGE_STRING = 1,
    STORAGE_REFERENCE = 2,
    STORAGE_NONE = 3,  // data type codes outside 0..20
  };

  static Storage StorageOf(unsigned dataType) {
    return dataType < kTypeCount ? static_cast<Storage>(kStorage[dataType]) : STORAGE_NONE;
  }
  // Bytes of one scalar value (1, 4 or 8); 0 for the other storage forms.
  static unsigned ScalarWidth(unsigned dataType) { return dataType < kTypeCount ? kWidth[dataType] : 0; }

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
  static bool PutScalar(SarnObject* object, const FieldInfo& field, const void* value);
  static bool PutString(SarnObject* object, const FieldInfo& field, const VekString& value);
  static bool PutReference(SarnObject* object, const FieldInfo& field, VekCore* value);

 private:
  static constexpr unsigned kTypeCount = 21;
  // By data type code: BOOL, BYTESTRING, CHANNEL_NUMBER, CURRENCY, DATE, DATETIME, ANY_DICT, ENUM,
  // FLOAT, INT_ID, LONG_ID, STRING_ID, KNOWN_DICT, KNOWN_DICT_AS_LAZY, SUBDICT, S64, S32, STRING,
  // TIME, U32, U64.
  static constexpr uint8_t kStorage[kTypeCount] = {0, 2, 0, 0, 0, 0, 2, 0, 0, 0, 0, 1, 2, 2, 2, 0, 0, 1, 0, 0, 0};
  static constexpr uint8_t kWidth[kTypeCount] = {1, 0, 8, 8, 4, 8, 0, 4, 8, 4, 8, 0, 0, 0, 0, 8, 4, 0, 4, 4, 8};
};

}  // namespace sarn
