// Helpers shared by the object, message and payload tests: objects from JSON text or from one
// field's value in a table, a copy through the binary form, type queries, the wrappers' own
// equality, the bytes left in a byte source, and bytes built from the inside out.
#pragma once

#include <sstream>
#include <string>

#include "sarn/Sarn.h"
#include "../fuzz/RpcFuzzSupport.h"
#include "testutil/TestUtil.h"

namespace objopstest {

using namespace sarn;
using sarntest::Str;

// JSON read as an object at version 0 through the Dictionary converter; null when refused.
inline ref<SarnObject> FromJson(VekMempool* pool, const std::string& json) {
  VekString error;
  ref<SarnObject> object;
  ref<Dictionary> tree = Dictionary::FromJson(VekString(json.c_str()), error, pool);
  if (tree) DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG).DictionaryToSarnObject(tree, 0, object, error);
  return object;
}

// The object's JSON text at `version`, or "null".
inline std::string ObjectJson(VekMempool* pool, const ref<SarnObject>& object, KernoVersion version = 0) {
  return object ? Str(JsonSarnObject(pool).SarnObjectToJson(object.Get(), version)) : "null";
}

inline ref<SarnObject> BinaryCopy(VekMempool* pool, const SarnObject* object) {
  return sarntest::ReadKnownDict(pool, sarntest::KnownDictBytes(pool, object));
}

inline const FieldInfo* FieldNamed(const StructInfo* info, const std::string& name) {
  for (unsigned n = 0; info != nullptr && n < info->nFieldInfo; ++n) {  // placeholders share name offset 0
    if (info->vFieldInfo[n].arity != SARN_ARITY_NONE && name == FieldName(info, info->vFieldInfo[n])) return &info->vFieldInfo[n];
  }
  return nullptr;
}

// An object of the type before the dot in `subject` whose field after it is `text`: a JSON value,
// raw scalars or null references ("0x..|0x..", "0X": an optional field's storage without its
// presence), a payload held as JSON text ("json:..."), or the default ("~").
inline ref<SarnObject> Side(VekMempool* pool, const std::string& subject, const std::string& text, const FieldInfo*& field) {
  const std::string type = subject.substr(0, subject.find('.')), name = subject.substr(subject.find('.') + 1);
  const bool isRaw = text.rfind("0x", 0) == 0 || text.rfind("0X", 0) == 0, isLazy = text.rfind("json:", 0) == 0;
  ref<SarnObject> object = text == "~" || isRaw || isLazy ? StructInfoMap::LookupStructByName(type.c_str())->pFactory(pool)
                                                         : FromJson(pool, "{\"type\": \"" + type + "\", \"" + name + "\": " + text + "}");
  field = FieldNamed(object->GetStructInfo(), name);
  if (isLazy) FieldAccess::PutReference(object.Get(), *field, LazyDict::FromJsonString(pool, VekString(text.c_str() + 5), 0).Get());
  std::stringstream values(isRaw ? text : "");
  for (std::string value; std::getline(values, value, '|');) {
    const uint64_t bits = std::stoull(value, nullptr, 16);
    TraitsOf(field->dataType).storage == DataTypeTraits::STORAGE_REFERENCE ? FieldAccess::PutReference(object.Get(), *field, nullptr)
                                                                          : FieldAccess::PutScalar(object.Get(), *field, &bits);
    if (text[1] == 'x') MarkFieldPresent(object.Get(), *field);
  }
  return object;
}

// Whether objects of the type may hold a field of `dataType` (`isAll` false: a required or multi one).
inline bool Holds(unsigned typeId, unsigned dataType, bool isAll, int depth = 0) {
  const StructInfo* info = StructInfoForId(typeId);
  for (unsigned n = 0; info != nullptr && depth < 6 && n < info->nFieldInfo; ++n) {
    const FieldInfo& f = info->vFieldInfo[n];
    if (f.arity == SARN_ARITY_NONE || (!isAll && f.arity == SARN_ARITY_OPTIONAL && f.dataType == dataType)) continue;
    if (f.dataType == dataType || (f.dataType == SARN_DATA_TYPE_SUBDICT && Holds(f.refIndex, dataType, isAll, depth + 1))) return true;
  }
  return false;
}

// `depth` lists (unifiedItemList), each holding the next as its one item, around a success.
inline ref<SarnObject> Nest(VekMempool* pool, int depth, const std::string& message) {
  ref<SarnObject> inner = FromJson(pool, "{\"type\": \"success\", \"message\": \"" + message + "\"}");
  for (const FieldInfo* item = FieldNamed(StructInfoForId(644), "item"); depth-- > 0;) {
    ref<SarnObject> outer = StructInfoForId(644)->pFactory(pool);
    FieldAccess::PutReference(outer.Get(), *item, inner.Get());
    inner = outer;
  }
  return inner;
}

using rpcfuzz::SameWrapper;
using rpcfuzz::SourceBytes;

// Nested length-prefixed bytes built from the innermost out in linear time: each Prepend puts its
// bytes in front of everything so far.
struct InsideOut {
  explicit InsideOut(const std::string& innermost) : reversedM(innermost.rbegin(), innermost.rend()) {}
  void Prepend(const std::string& bytes) { reversedM.append(bytes.rbegin(), bytes.rend()); }
  std::string Bytes() const { return std::string(reversedM.rbegin(), reversedM.rend()); }
  std::string reversedM;
};

// The known-dict bytes of `depth` errors of code `code`, each the cause of the next: code (08),
// text (1A 00), cause (2A) holding the known dict of type 346 (D2 15).
inline std::string ErrorChainBytes(int depth, char code) {
  InsideOut bytes(std::string("\xD2\x15\x04\x08", 4) + code + std::string("\x1A\x00", 2));
  for (int i = 1; i < depth; ++i) {
    bytes.Prepend(std::string("\x08", 1) + code + std::string("\x1A\x00\x2A", 3) + sarntest::Varint(bytes.reversedM.size()));
    bytes.Prepend("\xD2\x15" + sarntest::Varint(bytes.reversedM.size()));
  }
  return bytes.Bytes();
}

}  // namespace objopstest
