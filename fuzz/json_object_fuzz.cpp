// A JSON text read as an object by JsonSarnObject; byte 0 chooses the piece size of the byte
// source (1, 7, 64 or 16,384 bytes per read), the rest is the text.
// Oracles: no crash, leak or hang; the memory and byte-source entries agree (verdict, written
// object or message), delete both duplicates and leave the source where it was; an accepted object
// writes JSON (version 0) that reads back to an object writing the same text, except for texts of
// the writer that this reader refuses (below); where the Dictionary path (Dictionary::FromJson,
// then DictionaryToSarnObject at version 0) accepts the text too, both objects write the same
// JSON, except for the differences that the two paths make by design (below).
//
// Written texts this reader refuses: a channel number or currency left INVALID in a required
// field ("invalid"), an id of a type the registry lacks ("XXX"), an enum number without a name
// ("INVALID_VALUE:n"), an empty free-form dictionary ({}). Control bytes written as backslash-u
// read back as the six characters, which write the same text again, so a string stays stable; in
// a value of fixed shape (a currency code) the six characters no longer fit, so it is refused.
//
// Differences from the Dictionary path: free-form values (every scalar a string, one value per
// list element, {} refused), a SUBDICT whose object names another type, lazy members (captured
// text, not read), a repeated member (the later value here, the first there) and a repeated
// "type" (the later one names the type here).

#include "DictFuzzSupport.h"

namespace {

using namespace sarn;
using sarntest::Require;
using sarntest::Str;

// True when an object of the tree holds a free-form value, a lazy member or a subdict.
bool HoldsPathDifference(const SarnObject* object) {
  return dictfuzz::AnyField(object, [](const SarnObject* o, const FieldInfo& field) {
    const unsigned type = field.dataType;
    bool isOther = type != SARN_DATA_TYPE_KNOWN_DICT && (TraitsOf(type).isHoldingObjects || type == SARN_DATA_TYPE_ANY_DICT);
    for (unsigned i = 0; isOther && i < FieldAccess::Count(o, field); ++i) {
      if (FieldAccess::ReferenceAt(o, field, i) != nullptr) return true;
    }
    return false;
  });
}

// True when a dictionary of the tree repeats a name.
bool RepeatsName(const Dictionary& tree) {
  return dictfuzz::AnyValue(tree, [](const DictValue& value) {
    const auto& dictionary = static_cast<const Dictionary&>(value);
    return value.kindM == DictValue::KIND_DICTIONARY &&
           dictfuzz::AnyName(dictionary, [&](const VekString& name) { return dictionary.CountValues(name) > 1; });
  });
}

bool RefusedWhenWritten(const std::string& text) {
  return dictfuzz::HoldsUnnamedValue(text) || text.find("\"invalid\"") != std::string::npos ||
         text.find("{}") != std::string::npos || text.find("\\u00") != std::string::npos;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 1 || size > 200000) return 0;
  static const size_t kPieces[] = {1, 7, 64, 16384};
  const size_t piece = kPieces[data[0] % 4];
  const std::string text(reinterpret_cast<const char*>(data + 1), size - 1);
  VekMempool pool("fuzz");
  [&] {
    JsonSarnObject reader(&pool);
    ref<SarnObject> object, viaSource, again;
    const std::string memory = dictfuzz::ReadObject(&pool, reader, text, 0, object);
    Require(dictfuzz::ReadObject(&pool, reader, text, piece, viaSource) == memory);
    if (!object) return;
    const std::string second = dictfuzz::ReadObject(&pool, reader, memory, 0, again);
    Require(again ? second == memory : RefusedWhenWritten(memory));

    VekString treeError;
    ref<Dictionary> tree = Dictionary::FromJson(reinterpret_cast<const unsigned char*>(text.data()), text.size(),
                                                treeError, &pool);
    if (!tree) return;
    DictionarySarnObject converter(&pool, Schema::vStructDefG, Schema::nStructDefG);
    ref<SarnObject> viaTree;
    if (!converter.DictionaryToSarnObject(tree, 0, viaTree, treeError)) return;
    if (HoldsPathDifference(object.Get()) || RepeatsName(*tree)) return;
    Require(Str(JsonSarnObject(&pool).SarnObjectToJson(viaTree.Get(), 0)) == memory);
  }();
  Require(pool.GetUsedBytes() == 0);  // everything a read made is released with its result
  return 0;
}
