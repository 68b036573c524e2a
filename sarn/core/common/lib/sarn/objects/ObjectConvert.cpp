// The conversion members of SarnObject: the object as a Dictionary, a Dict or JSON text, and the
// deep copy, all through the Dictionary converter over the object's own pool. They are defined
// here rather than beside the class because the converter sits above the object model.
#include "sarn/dict/Dict.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/model/SarnHashTable.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "sarn/objects/DictionarySarnObject.h"

namespace sarn {

ref<Dictionary> SarnObject::ToDictionary(KernoVersion version) const {
  DictionarySarnObject converter(GetMempool(), Schema::vStructDefG, static_cast<int>(Schema::nStructDefG));
  return converter.SarnObjectToDictionary(this, version);
}

ref<Dict> SarnObject::ToDict(KernoVersion version) const {
  ref<Dictionary> dictionary = ToDictionary(version);
  if (!dictionary) return ref<Dict>();
  return MempoolNew<Dict, ref<Dictionary>>(GetMempool(), dictionary);
}

VekString SarnObject::ToString(bool pretty, KernoVersion version) const {
  ref<Dictionary> dictionary = ToDictionary(version);
  if (!dictionary) return VekString();
  return dictionary->ToJson(pretty);
}

ref<SarnObject> SarnObject::Clone(unsigned int typeId) const {
  // The id only names a "type" entry that the reader never looks at (it takes the first one, this
  // object's own), but an id that names nothing is refused before anything is made.
  if (typeId == 0 || typeId >= static_cast<unsigned>(Schema::nStructDefG) || Schema::vStructDefG[typeId] == nullptr) {
    return ref<SarnObject>();
  }
  VekMempool* pool = GetMempool();
  ref<Dictionary> dictionary = ToDictionary(0);
  if (!dictionary) return ref<SarnObject>();
  const VekString* typeKey = GetGlobalName(pool, "type");
  const VekString* typeName = GetGlobalName(pool, Schema::vStructDefG[typeId]->pName);
  if (typeKey == nullptr || typeName == nullptr || !dictionary->Add(*typeKey, *typeName)) return ref<SarnObject>();
  DictionarySarnObject converter(pool, Schema::vStructDefG, static_cast<int>(Schema::nStructDefG));
  ref<SarnObject> copy;
  VekString error;
  if (!converter.DictionaryToSarnObject(dictionary, 0, copy, error)) return ref<SarnObject>();
  return copy;
}

}  // namespace sarn
