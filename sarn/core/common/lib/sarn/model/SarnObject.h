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
// not be changed while another thread reads it, converts it, compares it or copies it.
//
// Conversion members (defined with the object converters in objects/ObjectConvert.cpp): ToDictionary,
// ToDict and ToString go through DictionarySarnObject over the object's pool and the registry;
// Clone is a round trip through that dictionary, so it is as exact as the dictionary texts are:
//   - a FLOAT comes back rounded to eight significant digits;
//   - a LONG_ID whose top 16 bits name no known prefix comes back as 0;
//   - the copy is null where reading back refuses what writing wrote: an enum number without a
//     name ("INVALID_VALUE:n"), an id written as "XXX" for want of a referenced type, an object
//     nested deeper than the JSON readers' depth limit (JsonLimits).
// The copy lives in the source's pool and has its own strings, byte strings and nested objects;
// free-form dictionaries (ANY_DICT) and lazy payloads (KNOWN_DICT_AS_LAZY) are shared with the
// source, so an entry added to one afterwards is seen through both.
//
// Equality (objects/ObjectEquality.cpp) compares the current field records of two objects in
// place, without converting anything, and stops at the first difference:
//   - objects of different type ids are unequal, even with nothing set;
//   - an OPTIONAL field present on one side only makes them unequal; absent on both sides it is
//     not compared, whatever its storage holds; REQUIRED and MULTI fields are always compared;
//   - byte strings are never equal, not even to themselves: an object with a REQUIRED or MULTI
//     BYTESTRING field (even an empty array) is unequal to every object, itself included;
//   - ENUM values compare by their low 16 bits, FLOAT values as doubles (NaN is unequal to
//     itself, 0.0 equals -0.0), free-form dictionaries by Dict::operator==, lazy payloads by
//     LazyDict::operator== (whatever form each holds its body in);
//   - a null reference (an unset REQUIRED dictionary, object or payload, a null array element)
//     equals another null and nothing else;
//   - a data type code past 20 in a field that takes part is unequal.
// Nested objects are walked on an explicit stack, so any depth compares without exhausting the
// C stack. Objects without free-form or lazy fields are compared without allocating (a walk
// deeper than 16 objects grows its stack in the left object's pool, and a pool that cannot give
// it makes the objects compare unequal). A reference cycle (an object nested in itself) is a
// caller's error that no reader can build; comparing one does not terminate.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"
#include "sarn/model/Schema.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace sarn {

class Dict;
class Dictionary;

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

  // The object as a Dictionary tree in the object's pool, with the fields that take part at
  // `version` (0: every field); null only when memory runs out.
  ref<Dictionary> ToDictionary(KernoVersion version) const;
  // ToDictionary wrapped in a new Dict in the object's pool; null when memory runs out.
  ref<Dict> ToDict(KernoVersion version) const;
  // The JSON text of ToDictionary (compact or pretty); empty when memory runs out.
  VekString ToString(bool pretty, KernoVersion version) const;
  // A deep copy of this object, of this object's own type whatever valid `typeId` is given.
  // Null, before anything is converted or allocated, when `typeId` is 0, at or beyond
  // Schema::nStructDefG or an empty slot; null when the dictionary does not read back.
  ref<SarnObject> Clone(unsigned int typeId) const;

  // Field-by-field equality (rules above); non-virtual, so that any two objects compare.
  bool operator==(const SarnObject& other) const;
  bool operator!=(const SarnObject& other) const { return !(*this == other); }
  // One single value of the record's data type: `a` and `b` point at the two storages of the
  // field (a value, a VekString or a reference).
  static bool SingleFieldEquals(const FieldInfo* field, void* a, void* b);
  // Two multi-value arrays of the record's data type: `a` and `b` point at the two platform arrays.
  static bool MultiFieldEquals(const FieldInfo* field, void* a, void* b);

  // Set by the generated constructor and never changed afterwards.
  uint32_t typeIdM;
};
static_assert(sizeof(SarnObject) == 24, "SarnObject header is 24 bytes");

}  // namespace sarn
