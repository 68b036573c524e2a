// Helpers shared by the equality, copy and version-conversion tests: objects from JSON text, and
// copies of an object through its JSON and binary forms.
#pragma once

#include <cstring>
#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestStreams.h"

namespace objopstest {

using namespace sarn;

// The JSON of a tree read as an object at version 0 (through the Dictionary converter); null
// when either step refuses it.
inline ref<SarnObject> FromJson(VekMempool* pool, const std::string& json) {
  VekString error;
  ref<Dictionary> tree = Dictionary::FromJson(reinterpret_cast<const unsigned char*>(json.data()), json.size(), error, pool);
  ref<SarnObject> object;
  DictionarySarnObject converter(pool, Schema::vStructDefG, Schema::nStructDefG);
  if (tree) converter.DictionaryToSarnObject(tree, 0, object, error);
  return object;
}

inline ref<SarnObject> JsonCopy(VekMempool* pool, const SarnObject* object) {
  return FromJson(pool, sarntest::Str(JsonSarnObject(pool).SarnObjectToJson(object, 0)));
}

inline ref<SarnObject> BinaryCopy(VekMempool* pool, const SarnObject* object) {
  ProtoBuf codec(pool, Schema::vStructDefG, Schema::nStructDefG);
  ProtoBufByteOutputStream out;
  codec.MarshalKnownDict(object, &out);
  std::string bytes = sarntest::Finished(out);
  ref<SarnObject> copy;
  codec.UnmarshalKnownDict(reinterpret_cast<const unsigned char*>(bytes.data()), static_cast<int>(bytes.size()), &copy);
  return copy;
}

inline const FieldInfo* FieldNamed(const StructInfo* info, const char* name) {
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];  // placeholders (arity NONE) share name offset 0
    if (field.arity != SARN_ARITY_NONE && std::strcmp(FieldName(info, field), name) == 0) return &field;
  }
  return nullptr;
}

// A nest of `depth` lists (unifiedItemList), each holding the next as its one item; the innermost
// holds a success with `message`.
inline ref<SarnObject> Nest(VekMempool* pool, int depth, const std::string& message) {
  ref<SarnObject> inner = FromJson(pool, "{\"type\":\"success\",\"message\":\"" + message + "\"}");
  for (int level = 0; level < depth; ++level) {
    ref<SarnObject> outer = StructInfoForId(644)->pFactory(pool);
    FieldAccess::PutReference(outer.Get(), *FieldNamed(outer->GetStructInfo(), "item"), inner.Get());
    inner = outer;
  }
  return inner;
}

}  // namespace objopstest
