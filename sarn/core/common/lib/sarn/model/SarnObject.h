// SarnObject: the base class of every generated schema type, and the small field-access layer the
// walkers use to read and write a field through its FieldInfo.
//
// Layout (a format: FieldInfo offsets address it): the VekCore part (virtual table, pool, 32-bit
// reference count) in bytes 0-19, the type id in bytes 20-23, then the generated class's presence
// flags from byte 24 and its field storage.
//
// Ownership: objects are made in a pool through a type's factory (StructInfo::pFactory) and held
// by ref<>; the last DownRef destroys the object, and the generated destructor releases everything
// the object holds (strings, arrays, nested objects and dictionaries).
//
// Thread safety: reference counts change atomically; the fields are not locked, so an object must
// not be changed while another thread reads it.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"
#include "sarn/model/Schema.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace sarn {

class SARN_EXPORT SarnObject : public VekCore {
 public:
  explicit SarnObject(uint32_t typeId) : typeIdM(typeId) {}
  ~SarnObject() override;

  // The pName of the object's type, as a new string ("address"); empty for an unknown id.
  VekString GetTypeName() const;
  // The object's type id (its slot in Schema::vStructDefG).
  uint32_t GetTypeId() const { return typeIdM; }
  // The StructInfo of the object's type, or null when the id names no type.
  const StructInfo* GetStructInfo() const { return StructInfoForId(typeIdM); }
  // Hands `id` on to the object's string arrays; the base has none and does nothing.
  virtual void SetDebugLockOwner(VekLockId id);

  // Set by the generated constructor and never changed afterwards.
  uint32_t typeIdM;
};
static_assert(sizeof(SarnObject) == 24, "SarnObject header is 24 bytes");

// The field-access layer. Every walker reads and writes fields through these, never through the
// generated classes.

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
// Records that an optional field now holds a value (sets its flag byte when it has one; a
// flagless reference field is present through its non-null reference).
inline void MarkFieldPresent(SarnObject* object, const FieldInfo& field) {
  if (field.flagOffset != 0) reinterpret_cast<unsigned char*>(object)[field.flagOffset] = 1;
}

}  // namespace sarn
