// JsonSarnObject: schema objects straight to JSON text (and, in a later step, back), without a
// Dictionary in between.
//
// Output form: one JSON object per schema object; a member is its name in double quotes, a colon,
// one space and the value; members are separated by ", "; array elements by a bare ","; no line
// breaks. Fields are written in field-number order, filtered by the version (0: every field), with
// the pseudo-field "type" (the type name) placed just before the last written field whose name
// sorts below "type", or last when there is none. BOOL, S32 and U32 values are bare; every other
// scalar travels as a quoted string. A null element of a reference array is left out.
//
// Writing does not recurse on the depth of the object tree: nested objects (also objects held by
// lazy payloads) are walked with an explicit stack, so any depth is written; it fails only when
// memory runs out.
//
// Ownership and pools: the converter owns nothing but its scratch array; the strings it makes live
// in pMempoolM and are released before a call returns; the caller owns the output buffer.
//
// Thread safety: one thread at a time per converter. Writing only reads the objects and the
// constant schema tables, so several converters may write the same objects concurrently.
#pragma once

#include <cstdint>

#include "sarn/values/ByteBuffer.h"
#include "sarn/base/Export.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "vek/VekArray.h"
#include "vek/VekString.h"

namespace sarn {

class LazyDict;

class SARN_EXPORT JsonSarnObject {
 public:
  // Over the registry's struct table (Schema::vStructDefG, Schema::nStructDefG).
  explicit JsonSarnObject(VekMempool* mempool);
  ~JsonSarnObject();
  JsonSarnObject(const JsonSarnObject&) = delete;
  JsonSarnObject& operator=(const JsonSarnObject&) = delete;

  // Appends the JSON text of `object` (and everything it holds) to `out`. False only when memory
  // runs out; `out` is then failed (ByteBuffer::HasFailed) rather than left with a piece missing.
  bool SarnObjectToJson(const SarnObject* object, KernoVersion version, ByteBuffer& out);
  // The same text as a new string in pMempoolM; empty when memory runs out.
  VekString SarnObjectToJson(const SarnObject* object, KernoVersion version);

  // One optional or required field (presence is the caller's test). Reference values that are
  // null write nothing at all, not even the name.
  void SingleFieldToJson(const char* name, const FieldInfo* field, const SarnObject* object, ByteBuffer& out,
                         bool& fFirst, KernoVersion version);
  // One multi-valued field; an empty array (or one holding only null references) writes nothing.
  void MultiFieldToJson(const char* name, const FieldInfo* field, const SarnObject* object, ByteBuffer& out,
                        bool& fFirst, KernoVersion version);
  // The lead-in of one member: ", " unless it is the first, then the quoted name, a colon, a space.
  void WriteFieldName(const char* name, ByteBuffer& out, bool& fFirst);
  // A lazy payload in its compact JSON form.
  void LazyToJson(const LazyDict* lazy, ByteBuffer& out);

  VekMempool* pMempoolM;
  const StructInfo* const* pStructDefsM;
  uint32_t nStructDefsM;
  // Used by the reading side: objects entered in the current pass, and the type of each.
  uint32_t nObjectIndexM;
  VekGenericIntArray vObjectTypesM;

 private:
  // The format's side of the shared object walk (model/internal/ObjectWalk.h).
  class Writer;
};

}  // namespace sarn
