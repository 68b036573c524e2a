// ProtoBuf: schema objects to and from the protocol-buffer wire encoding, free-form dictionaries
// inside them, and the reader of the version-1 envelope objects.
//
// Like every converter it knows no type by name: it walks the StructInfo and FieldInfo tables, so
// field numbers (a record's index), data types and arities come from the metadata, and objects are
// made only through the factories of the registry. The binary form ignores schema versions: every
// field of the current table is written and read.
//
// Wire format of an object's fields: in table order, tag = field number * 8 + wire type, OPTIONAL
// fields only when present, REQUIRED fields always, MULTI fields one tag per element (never packed).
// Nested objects are length-delimited through the sections of ProtoBufByteOutputStream, so the
// writer never computes a length in advance. A known dict (an object naming its own type) is the
// tag type id * 8 + 2 followed by the length-delimited fields; an any-dict is built of one-byte
// tags: entries 34 (name 50, value sections 66), a string value 18, a nested dictionary's entries
// directly in its value section.
//
// What the format implies and we keep: a REQUIRED field is written even at its default, so a
// REQUIRED channel number or currency left INVALID is written as "invalid", which the reader
// refuses: such a default object does not read back. BOOL is read only as 0 or 1; packed fields,
// groups and wire type 5 are not read; a 32-bit varint has at most five bytes; a singular field
// that occurs twice keeps the later value. A REQUIRED field of a reference type whose reference is
// null is skipped, like an absent OPTIONAL one, since an empty value would not read back as null;
// a null element of an array of references is left out, as the JSON writer leaves it out.
//
// Untrusted input: the reader never reads past `end`, checks every declared length against the
// bytes that remain before it allocates, refuses a type id beyond the table or at an empty slot,
// and bounds nesting (known dicts, sub-objects, any-dict levels) by the limits given to the value
// (Limits, the JSON readers' default, so that what they accept and the writer writes reads back).
// Past the limit every entry point fails as on malformed input. A MULTI field past the platform
// arrays' 65,535 elements fails the read. Unknown and undefined field numbers are not errors: they
// are reported on standard output and skipped.
//
// Ownership: results are new objects in pMempoolM owned by the caller; partially read objects are
// dropped. Thread safety: none; a ProtoBuf value and what it writes belong to one thread.
#pragma once

#include "sarn/base/Export.h"
#include "sarn/base/Limits.h"
#include "sarn/binary/ProtoBufByteOutputStream.h"
#include "sarn/dict/Dict.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "vek/VekCore.h"

namespace sarn {

class SARN_EXPORT ProtoBuf {
 public:
  ProtoBuf(VekMempool* pool, const StructInfo* const* structDefs, int count, const Limits& limits = Limits());

  // ---- Writing --------------------------------------------------------------------------------
  // Nested objects are walked with an explicit stack, so any depth is written. Writing fails only
  // for lack of memory, and then as the stream's own growth does: `out` turns out of memory and
  // Finish gives no bytes.
  // The object's fields: no tag, no length (the top-level form of an object of a known type).
  void Marshal(const SarnObject* object, ProtoBufByteOutputStream* out) const;
  void MarshalDict(const SarnObject* object, ProtoBufByteOutputStream* out) const;
  void MarshalFields(const StructInfo* info, const SarnObject* object, ProtoBufByteOutputStream* out) const;
  // The value of one single field, after its tag.
  void MarshalSingleField(const FieldInfo* field, const SarnObject* object, ProtoBufByteOutputStream* out) const;
  // Every element of a MULTI field, each after `tag`.
  void MarshalMultiField(int tag, const FieldInfo* field, const SarnObject* object, ProtoBufByteOutputStream* out) const;
  void MarshalSubdict(const SarnObject* object, ProtoBufByteOutputStream* out) const;
  // Tag (type id * 8 + 2), then the fields length-delimited: how one object travels on its own.
  void MarshalKnownDictValue(const SarnObject* object, ProtoBufByteOutputStream* out) const;
  void MarshalKnownDict(const SarnObject* object, ProtoBufByteOutputStream* out) const;
  void MarshalKnownDictField(const SarnObject* object, ProtoBufByteOutputStream* out) const;
  void MarshalKnownDictAsLazyField(const LazyDict* payload, ProtoBufByteOutputStream* out) const;
  // The entries in byte order of names; WithLength puts them in a section.
  void MarshalAnyDict(Dict* dict, ProtoBufByteOutputStream* out) const;
  void MarshalAnyDictWithLength(Dict* dict, ProtoBufByteOutputStream* out) const;
  // One entry's content: the name, then one value section per stored value.
  void MarshalAnyDictField(Dict* dict, const VekString& name, ProtoBufByteOutputStream* out) const;
  // One value section's content.
  void MarshalAnyDictValue(Dict* dict, const VekString& name, unsigned long index, ProtoBufByteOutputStream* out) const;

  // ---- Reading (false on malformed input, result untouched) ----------------------------------
  // The fields of one object of type `typeId` occupying exactly `length` bytes.
  bool Unmarshal(const unsigned char* data, int length, unsigned int typeId, ref<SarnObject>* result) const;
  bool UnmarshalDict(const unsigned char** cursor, const unsigned char* end, unsigned int typeId,
                     ref<SarnObject>* result) const;
  bool UnmarshalFields(const StructInfo* info, const unsigned char** cursor, const unsigned char* end,
                       SarnObject* object) const;
  bool UnmarshalOneSingleValue(const FieldInfo* field, const unsigned char** cursor, const unsigned char* end,
                               SarnObject* object) const;
  // Reads one element and appends it to the field's array.
  bool UnmarshalOneMultiValue(const FieldInfo* field, const unsigned char** cursor, const unsigned char* end,
                              SarnObject* object) const;
  bool UnmarshalSubdict(const unsigned char** cursor, const unsigned char* end, unsigned int typeId,
                        ref<SarnObject>* result) const;
  // A known-dict value occupying exactly `length` bytes.
  bool UnmarshalKnownDict(const unsigned char* data, int length, ref<SarnObject>* result) const;
  bool UnmarshalKnownDictValue(const unsigned char** cursor, const unsigned char* end, ref<SarnObject>* result) const;
  bool UnmarshalKnownDictField(const unsigned char** cursor, const unsigned char* end, ref<SarnObject>* result) const;
  // The bytes are kept unparsed in a payload (LazyDict::FromBytestring).
  bool UnmarshalKnownDictAsLazyField(const unsigned char** cursor, const unsigned char* end,
                                     ref<LazyDict>* result) const;
  // The range must hold a dictionary value; the cursor ends at `end`.
  bool UnmarshalAnyDict(const unsigned char** cursor, const unsigned char* end, ref<Dict>* result) const;
  bool UnmarshalAnyDictWithLength(const unsigned char** cursor, const unsigned char* end, ref<Dict>* result) const;
  // One entry, added to `dict`.
  bool UnmarshalAnyDictField(const unsigned char* begin, const unsigned char* end, const ref<Dict>& dict) const;
  // One value section: a string (kind TYPE_STRING, `text`) or a dictionary (TYPE_DICT, `dict`).
  bool UnmarshalAnyDictValue(const unsigned char* begin, const unsigned char* end, dictvalue::Type& kind,
                             VekString& text, ref<Dict>& dict) const;
  // Wire types 0 (a varint), 1 (eight bytes) and 2 (a length and its bytes); any other fails.
  bool SkipFieldValue(unsigned int wireType, const unsigned char** cursor, const unsigned char* end) const;

  // Version-1 envelopes; never null: an `error` object (code badArgument) on failure.
  ref<SarnObject> UnmarshalWrapper(const unsigned char* data, int length) const;
  ref<SarnObject> UnmarshalRequestWrapper(const unsigned char** cursor, const unsigned char* end) const;
  ref<SarnObject> UnmarshalResponseWrapper(const unsigned char** cursor, const unsigned char* end) const;

  // A new Dict over the object's Dictionary form with every field (version 0).
  ref<Dict> DictFromSarnObject(const ref<SarnObject>& object) const;

  VekMempool* pMempoolM;
  const StructInfo* const* structDefsM;
  int structDefCountM;

 private:
  class DepthGuard;
  // An envelope's body range read as a known-dict value; an `error` object with `failure` when it
  // does not read (or is missing).
  ref<SarnObject> ReadBody(const unsigned char* begin, const unsigned char* end, const char* failure) const;
  // The binary side of the shared object walk (model/internal/ObjectWalk.h).
  class Writer;
  bool ReadValue(const FieldInfo* field, const unsigned char** cursor, const unsigned char* end,
                 SarnObject* object) const;

  Limits limitsM;
  mutable int depthM;
};

// An object of the schema type `error` with the code badArgument and `text`; null only when the
// pool is exhausted.
SARN_EXPORT ref<SarnObject> MakeErrorObject(VekMempool* pool, const VekString& text);

}  // namespace sarn
