// DictionarySarnObject: schema objects to Dictionary trees and back, field by field, under a schema
// version (0: every field with its current description, and required fields not enforced).
//
// Object to Dictionary: a dictionary that starts with "type" (the type name) and holds every
// present field under its name; scalars become StringValues (BOOL, S32, U32 and FLOAT marked bare,
// the rest quoted; the writer still quotes any text that is not a bare token, so a float such as
// 1.5 comes out as "1.5"), nested objects nested dictionaries, multi-valued fields ArrayValues (empty ones
// and null references are left out); free-form dictionaries and lazy payloads are shared, not
// copied. This direction fails only when memory runs out (the result is then null, never a tree
// with a value missing), and it walks nested objects with an explicit stack, so any depth is
// converted.
//
// Dictionary to object: the first "type" value names the type; each field of the type is read
// from the first value under its name; names that are not fields are ignored. Failures return
// false with the reason appended to (or, for a few scalar failures, replacing) `error`, built from
// the inside out; the partly filled object is dropped and `out` is left as it was. A tree nested
// deeper than the JSON readers' depth limit is refused.
//
// Ownership and pools: every object, dictionary, value and string made by a conversion lives in
// pMempoolM and belongs to the caller through the returned references. Dictionary keys are the
// shared strings of the global name cache.
//
// Thread safety: a converter is used by one thread at a time; it keeps no state between calls.
#pragma once

#include <cstdint>

#include "sarn/dict/DictValue.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/base/Export.h"
#include "sarn/base/Limits.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "vek/VekString.h"

namespace sarn {

class LazyDict;

class SARN_EXPORT DictionarySarnObject {
 public:
  // Built over the registry: DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG).
  DictionarySarnObject(VekMempool* pool, const StructInfo* const* structDefs, int count);

  ref<Dictionary> SarnObjectToDictionary(const SarnObject* object, KernoVersion version);
  bool DictionaryToSarnObject(const ref<Dictionary>& dictionary, KernoVersion version, ref<SarnObject>& out,
                              VekString& error);
  // The same with the nesting depth bounded by `limits` instead of the readers' default.
  bool DictionaryToSarnObject(const ref<Dictionary>& dictionary, KernoVersion version, ref<SarnObject>& out,
                              VekString& error, const JsonLimits& limits);

  // Adds one optional or required field's value under `name` (nothing for a null reference).
  void SingleFieldToDict(const VekString& name, const FieldInfo* field, const SarnObject* object,
                         ref<Dictionary>& dictionary, KernoVersion version);
  // Adds an ArrayValue of the field's elements under `name`, unless it would be empty.
  void MultiFieldToDict(const VekString& name, const FieldInfo* field, const SarnObject* object,
                        ref<Dictionary>& dictionary, KernoVersion version);
  // Reads `value` into a single field, or appends it as one element of a multi-valued field.
  bool DictToSingleField(const FieldInfo* field, const ref<DictValue>& value, SarnObject* object, VekString& error,
                         KernoVersion version);
  bool DictToMultiField(const FieldInfo* field, const ref<DictValue>& value, SarnObject* object, VekString& error,
                        KernoVersion version);

  // An id text of the field's referenced type (its prefix, then the rest) to its stored value.
  static bool StringToIntId(VekMempool* pool, const FieldInfo* field, const VekString& text, VekString& error,
                            unsigned int& out);
  static bool StringToLongId(VekMempool* pool, const FieldInfo* field, const VekString& text, VekString& error,
                             unsigned long long& out);
  static bool StringToStringId(VekMempool* pool, const FieldInfo* field, const VekString& text, VekString& error,
                               VekString& out);
  // The same over the bytes [text, text + n), which need not end with a NUL: readers that hold
  // the text in place convert it without a string of their own. Texts, values and messages are
  // those of the string forms (one implementation); `whole`, when given, is the text as a string
  // (read where it is, and a string id without prefix shares it).
  static bool StringToIntId(VekMempool* pool, const FieldInfo* field, const char* text, size_t n, VekString& error,
                            unsigned int& out, const VekString* whole = nullptr);
  static bool StringToLongId(VekMempool* pool, const FieldInfo* field, const char* text, size_t n, VekString& error,
                             unsigned long long& out, const VekString* whole = nullptr);
  static bool StringToStringId(VekMempool* pool, const FieldInfo* field, const char* text, size_t n, VekString& error,
                               VekString& out, const VekString* whole = nullptr);

  VekMempool* pMempoolM;
  const StructInfo* const* structDefsM;
  int structDefCountM;

 private:
  // The Dictionary side of the shared object walk (model/internal/ObjectWalk.h).
  class Builder;

  // Value `i` of a field whose values are not schema objects, as a dictionary value; null when it
  // is left out.
  ref<DictValue> MakeValue(const FieldInfo& field, const SarnObject* object, unsigned i);

  bool ReadValue(const FieldInfo& field, const ref<DictValue>& value, SarnObject* object, VekString& error,
                 KernoVersion version, bool isMulti);
  bool StringToEnum(const FieldInfo& field, const VekString& text, VekString& error, uint32_t& value);
  // The length of the prefix that starts the text; false with the messages of a bad prefix.
  static bool SkipIdPrefix(VekMempool* pool, const FieldInfo* field, const char* text, size_t n, VekString& error,
                           size_t& prefixLength);
  static void AppendBadPrefix(VekMempool* pool, const char* text, size_t n, VekString& error);
  static bool DictValueToLazyDict(const ref<DictValue>& value, ref<LazyDict>& out, VekString& error,
                                  VekMempool* pool, KernoVersion version);

  // Nesting depth of the dictionary being read (the top one is 1), and its bound.
  int depthM;
  int maxDepthM;
};

}  // namespace sarn
