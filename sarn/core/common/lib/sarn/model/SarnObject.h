// SarnObject: the base class of every generated schema type. Its fields are read and written
// through their FieldInfo by the field-access layer (FieldAccess.h), never through the classes.
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

}  // namespace sarn
