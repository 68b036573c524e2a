// Arbitrary JSON through Dictionary::FromJson and DictionaryToSarnObject under a known type and a
// version chosen by the first two bytes (byte 0 = 255 keeps the text's own "type").
// Oracle: no crash; an accepted object writes JSON that reads back (at version 0, which enforces
// no required field and consults no older record) to an object writing the same text, and its
// Dictionary converts back to an object writing the same text too. The one exception is by
// design: a value the text forms cannot name (an enum number without a name, written
// "INVALID_VALUE:n", or an id of a type the registry lacks, written "XXX") is written but refused
// on reading; an accepted object holds one only when a required field was missing at version 0.
// And since JSON text never turns a backslash-u escape back into its byte, a control byte inside
// a value parsed from text (a currency code, say) does not survive: such a text must read back to
// one that is then stable.
#include "DictFuzzSupport.h"

namespace {

using namespace sarn;
using sarntest::Require;
using sarntest::Str;

// The types of the registry, in id order.
std::vector<const StructInfo*> KnownTypes() {
  std::vector<const StructInfo*> types;
  for (int id = 0; id < Schema::nStructDefG; ++id) {
    if (Schema::vStructDefG[id] != nullptr) types.push_back(Schema::vStructDefG[id]);
  }
  return types;
}

// Null only for a text that holds an unnamed value.
ref<SarnObject> Read(VekMempool* pool, const std::string& json, KernoVersion version) {
  VekString error;
  ref<Dictionary> tree = Dictionary::FromJson(reinterpret_cast<const unsigned char*>(json.data()), json.size(), error, pool);
  Require(tree != nullptr);
  DictionarySarnObject converter(pool, Schema::vStructDefG, Schema::nStructDefG);
  ref<SarnObject> object;
  bool ok = converter.DictionaryToSarnObject(tree, version, object, error);
  Require(ok || dictfuzz::HoldsUnnamedValue(json));
  return object;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 2) return 0;
  VekMempool pool("fuzz");
  {
    KernoVersion version = data[1] % 37 == 0 ? 0 : 6 + data[1] % 37;
    VekString error;
    ref<Dictionary> tree = Dictionary::FromJson(data + 2, size - 2, error, &pool);
    if (tree == nullptr) return 0;
    if (data[0] != 255) {
      const std::vector<const StructInfo*> types = KnownTypes();
      const StructInfo* type = types[(data[0] * 7u) % types.size()];
      tree->Remove("type");
      tree->Add(VekString("type"), VekString(type->pName));
    }
    DictionarySarnObject converter(&pool, Schema::vStructDefG, Schema::nStructDefG);
    ref<SarnObject> object;
    if (converter.DictionaryToSarnObject(tree, version, object, error)) {
      JsonSarnObject json(&pool);
      std::string text = Str(json.SarnObjectToJson(object.Get(), version));
      ref<SarnObject> again = Read(&pool, text, 0);
      if (again == nullptr) return 0;
      std::string second = Str(json.SarnObjectToJson(again.Get(), version));
      if (second != text) {
        Require(text.find("\\u00") != std::string::npos);
        ref<SarnObject> third = Read(&pool, second, 0);
        Require(third != nullptr && Str(json.SarnObjectToJson(third.Get(), version)) == second);
        return 0;
      }

      ref<Dictionary> back = converter.SarnObjectToDictionary(object.Get(), 0);
      ref<SarnObject> fromTree;
      Require(converter.DictionaryToSarnObject(back, 0, fromTree, error));
      Require(Str(json.SarnObjectToJson(fromTree.Get(), version)) == text);
    }
  }
  return 0;
}
