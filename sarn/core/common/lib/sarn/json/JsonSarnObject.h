// JsonSarnObject: schema objects straight to JSON text and back, without a Dictionary in between.
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
// Reading (JsonToSarnObject) takes a text that names each object's type in a member "type", which
// may stand anywhere among the members. The text is walked twice over two cursors on the same
// bytes: the first pass creates nothing and records, per JSON object in the order the braces open
// (its ordinal), the type its "type" member names (vObjectTypesM); the second pass creates each
// object from its recorded type as its brace opens and reads every member straight into the
// matching field (the first field of that name whose arity is not NONE, whatever `version` says).
// Unknown members are skipped, their objects still counted. The reader is tolerant where the text
// is unambiguous: members may be bare words, numbers may be quoted or bare (read as sscanf reads
// them: leading whitespace skipped, trailing text ignored, a minus wraps unsigned types), a comma
// may stand before a closing brace or bracket, an array field may be given one bare value, nested
// arrays are flattened, a repeated member is read again (single fields keep the later value,
// arrays append). Free-form (ANY_DICT) values go through the free-form reader below, where every
// scalar becomes a string. A lazy member (KNOWN_DICT_AS_LAZY) is not read: its exact bytes from
// brace to brace (across blocks too) are captured through the cursor's echo into an in-memory
// stream, held by a byte-source payload of version 0 and written again by the payload's writers.
//
// Decisions of the reader:
// - A value starting with '[' for a field that is not multi-valued fails ("Array value given for
//   a single field.", then the object's words " Failed to parse value for key " and the key).
// - Nesting: `depth` is the number of containers (objects and arrays, free-form ones included)
//   open around a value. Both passes and the capture of a lazy member refuse a container past
//   limitsM.maxDepthM with the Dictionary readers' message (kJsonDepthLimitFormat), so all three
//   readers accept and refuse the same documents; at the default a read fits a 256 KiB stack. The
//   depth message is never discarded: where an inner text is otherwise dropped it is kept, and the
//   outer words follow it.
// - A text of more than 65,535 objects fails with kJsonObjectCountLimitMessage, an array field
//   past 65,535 elements with kJsonArrayLimitMessage; nothing wraps or is dropped.
// - In the free-form reader an object needs at least one member: {} fails ("bad field in
//   AnyDictValue"), although the Dictionary path reads it as an empty dictionary (and writes an
//   empty Dict as {}): such a text converts only through the Dictionary path. In a free-form list a
//   value that consumes no input fails ("bad value in AnyDictField") unless the list's closing
//   bracket follows it: [] and ["a",] add an empty string, a nested '[', a stray '}' or the end
//   of the input fail.
// - The first pass walks free-form values like objects; so that the free-form lists' tolerance of
//   elements separated by whitespace alone can be reached, the first pass (only) accepts such
//   arrays too (an element that consumes no input ends the walk). The second pass reads typed
//   arrays strictly, messages included.
// - Failures return false with the message joined from the inside out; the partly built object
//   is released and *result set to null. When the top-level object names no known type, false is
//   returned with `error` untouched.
//
// Ownership and pools: the converter owns nothing but its scratch array; the strings it makes live
// in pMempoolM and are released before a call returns; the caller owns the output buffer.
//
// Thread safety: one thread at a time per converter. Writing only reads the objects and the
// constant schema tables, so several converters may write the same objects concurrently.
#pragma once

#include <cstdint>

#include "sarn/values/ByteBuffer.h"
#include "sarn/values/Json.h"
#include "sarn/base/Export.h"
#include "sarn/base/Limits.h"
#include "sarn/dict/Dict.h"
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

  // ---- Reading -----------------------------------------------------------------------------
  // The two-pass read over two cursors on the same text. True with the object in *result.
  bool JsonToSarnObject(InputPointerBytesource& firstPass, InputPointerBytesource& secondPass, KernoVersion version,
                        ref<SarnObject>* result, VekString& error);
  // Reads from two duplicates of `source` (only its Duplicate() is called: it is never read, moved
  // or deleted); both duplicates are deleted before returning. `bytesRead` is what the first pass
  // obtained from its duplicate. A source that gives no duplicate fails with
  // "Byte source cannot be duplicated.".
  bool JsonToSarnObject(wynbaselib::Bytesource* source, size_t& bytesRead, KernoVersion version,
                        ref<SarnObject>* result, VekString& error);
  // Reads `length` bytes in memory; a negative length fails with "Negative JSON length.".
  bool JsonToSarnObject(const unsigned char* data, int length, KernoVersion version, ref<SarnObject>* result,
                        VekString& error);

  // One JSON object, created from `type` in the second pass (no type: walked, nothing created).
  bool Unmarshal(int depth, InputPointerBytesource& input, const StructInfo* type, ref<SarnObject>* result,
                 VekString& error);
  // The value of one member; `field` is null for an unknown member and in the first pass, where
  // `object` is null too.
  bool ReadFieldValue(int depth, InputPointerBytesource& input, const FieldInfo* field, ref<SarnObject> object,
                      VekString& error);
  bool UnmarshalOneSingleValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                               ref<SarnObject> object, VekString& error);
  bool UnmarshalOneMultiValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                              ref<SarnObject> object, VekString& error);
  bool ArrayValueFromJson(int depth, InputPointerBytesource& input, const FieldInfo* field, ref<SarnObject> object,
                          VekString& error);
  bool ArrayValueReadFieldValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                ref<SarnObject> object, VekString& error);

  // The free-form reader: a JSON object into a Dict, every scalar as its text.
  bool UnmarshalAnyDict(int depth, InputPointerBytesource& input, ref<Dict>* result, VekString& error);
  bool UnmarshalAnyDict(InputPointerBytesource& input, ref<Dict>* result);  // the error text discarded
  bool UnmarshalAnyDictValue(int depth, InputPointerBytesource& input, dictvalue::Type& type, VekString& text,
                             ref<Dict>& dict, VekString& error);
  bool UnmarshalAnyDictField(int depth, InputPointerBytesource& input, const ref<Dict>& dict, VekString& error);

  VekMempool* pMempoolM;
  const StructInfo* const* pStructDefsM;
  uint32_t nStructDefsM;
  // Used by the reading side: objects entered in the current pass, and the type of each.
  uint32_t nObjectIndexM;
  VekGenericIntArray vObjectTypesM;
  // Bounds of the reading side (nesting depth).
  Limits limitsM;

 private:
  class Reader;
  friend class Reader;
  // Per-type field-name indexes and other scratch of the reading side, made on first use.
  struct ReadState;
  ReadState* pReadStateM;
  void ReleaseReadState();

  // The format's side of the shared object walk (model/internal/ObjectWalk.h).
  class Writer;
};

}  // namespace sarn
