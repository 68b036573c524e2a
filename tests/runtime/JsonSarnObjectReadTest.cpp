// The JSON-to-object reader: the table of texts with their outcomes (read from memory and from
// byte sources in pieces of 1, 7 and 16,384 bytes, which must agree), the free-form reader's own
// messages, lazy capture across block boundaries, and depth and count limits at their edges.
// Objects of every type written, read and written again are the object reader fuzz target's
// random_object_* seeds.
#include "../fuzz/DictFuzzSupport.h"
#include "runtime/ObjectOpsSupport.h"

namespace {

using namespace sarn;
using sarntest::Str;

class JsonReadTest : public sarntest::PoolTest {
 protected:
  // The written object, or "!" and the message (fuzz/DictFuzzSupport.h), from memory, where a
  // stale result must be cleared.
  std::string Memory(const std::string& text, KernoVersion version = 0) {
    ref<SarnObject> object = sarnschema::Success::Factory(&poolM);
    return dictfuzz::ReadObject(&poolM, readerM, text, 0, object, version);
  }
  // From a byte source in pieces; a text ending in '}' must be read to its end.
  std::string Source(const std::string& text, size_t piece) {
    ref<SarnObject> object;
    size_t bytesRead = 0;
    std::string got = dictfuzz::ReadObject(&poolM, readerM, text, piece, object, 0, &bytesRead);
    EXPECT_TRUE(got[0] == '!' || text.back() != '}' || bytesRead == text.size()) << bytesRead;
    return got;
  }
  // The members of `text` that `names` names, as "name=compact json" (null for none).
  std::string Pick(const std::string& text, const std::string& names) {
    VekString error;
    ref<Dictionary> from = Dictionary::FromJson(VekString(text.c_str()), error, &poolM);
    ref<Dictionary> want = Dictionary::FromJson(VekString(names.c_str()), error, &poolM);
    if (!from || !want) return "unparsable: " + text;
    VekStringArray list(nullptr);
    want->GetSortedNames(list);
    std::string out;
    for (int i = 0; i < list.Count(); ++i) {
      ref<DictValue> value = from->Get(list[i]);
      out += Str(list[i]) + "=" + (value ? Str(value->ToJson(false)) : "null") + " ";
    }
    return out;
  }

  JsonSarnObject readerM{&poolM};
};

TEST_F(JsonReadTest, TableOfTextsAgreesThroughEveryEntryPoint) {
  // One converter reads every row; a refusal's message is joined from the inside out.
  for (const auto& row : sarntest::ReadTable("json/object-reads.txt", 2)) {
    std::string got = Memory(row[0]);
    for (size_t piece : {1, 7, 16384}) EXPECT_EQ(Source(row[0], piece), got) << row[0] << " in pieces of " << piece;
    EXPECT_EQ(row[1][0] == '!' ? got : Pick(got, row[1]), row[1][0] == '!' ? row[1] : Pick(row[1], row[1])) << row[0];
  }
  // The version restricts nothing (isVisible is carried from version 9 on); entry-point refusals.
  EXPECT_EQ(Memory("{\"type\": \"syncDeltaInternal\", \"isVisible\": true}", 7),
            "{\"type\": \"syncDeltaInternal\", \"isVisible\": true}");
  ref<SarnObject> object;
  VekString negative, error;
  EXPECT_FALSE(readerM.JsonToSarnObject(reinterpret_cast<const unsigned char*>("{}"), -1, 0, &object, negative));
  EXPECT_EQ(Str(negative), "Negative JSON length.");
  sarntest::TestSource undup({"{}"});
  size_t bytesRead = 0;
  EXPECT_FALSE(readerM.JsonToSarnObject(&undup, bytesRead, 0, nullptr, error));
  EXPECT_EQ(Str(error) + std::to_string(undup.nReadM), "Byte source cannot be duplicated.0");
}

TEST_F(JsonReadTest, FreeFormReaderThroughItsOwnEntry) {
  // Rows starting with "field " go to UnmarshalAnyDictField (whose own messages the value level
  // replaces), the others to UnmarshalAnyDict.
  for (const auto& row : sarntest::ReadTable("json/anydict-reads.txt", 2)) {
    bool isField = row[0].compare(0, 6, "field ") == 0;
    std::string text = isField ? row[0].substr(6) : row[0];
    InputPointerBytesource input(reinterpret_cast<const unsigned char*>(text.data()), text.size());
    ref<Dict> dict = isField ? MakeDict(&poolM) : ref<Dict>();
    VekString error;
    bool isOk = isField ? readerM.UnmarshalAnyDictField(0, input, dict, error) : readerM.UnmarshalAnyDict(0, input, &dict, error);
    EXPECT_EQ(isOk ? Str(dict->dictionaryM->ToJson(false)) : "! " + Str(error), row[1]) << row[0];
  }
}

// The bytes a captured member's source gives, read from a duplicate.
std::string Captured(const LazyDict* lazy) {
  bool isCapture = lazy != nullptr && lazy->repM == LazyDict::REP_BYTESOURCE && lazy->versionM == 0;
  return isCapture ? objopstest::SourceBytes(lazy->pBytesourceM) : "no capture";
}

TEST_F(JsonReadTest, LazyMembersKeepTheirExactBytesAcrossBlockBoundaries) {
  const std::string member = "{ \"type\" :\"success\",\n\t\"message\": \"a\\\"b\" , \"x\": [{}, {\"y\": 1}] ,}";
  for (int shift = -8; shift <= 8; ++shift) {
    std::string head = "{\"type\": \"kernoRpcRequest\", \"rpcId\": 4, \"pad\": \"";
    head += std::string(16384 + shift - head.size() - 16, 'p') + "\",  \"request\":  ";
    std::string text = head + member + " , \"kernoVersion\": 9}";
    // The trailing comma keeps the streaming parser from reading the member: written unchanged.
    EXPECT_NE(Memory(text).find("\"request\": " + member + ", "), std::string::npos) << shift;
    for (size_t piece : {7, 16384}) {
      ref<SarnObject> object;
      ASSERT_NE(dictfuzz::ReadObject(&poolM, readerM, text, piece, object)[0], '!');
      auto* request = static_cast<sarnschema::KernoRpcRequest*>(object.Get());
      const LazyDict* lazy = request->requestM.Get();
      EXPECT_EQ(Captured(lazy) + Str(lazy->ToJson(false)) + Str(lazy->ToJson(true)) +
                    std::to_string(request->kernoVersionM), member + member + member + "9") << shift;
    }
  }
}

TEST_F(JsonReadTest, ArraysOfLazyMembersAndAnEchoAlreadyRunning) {
  // A hand-made type with a lazy array, reached as the subdict of testAllTypes' "struct".
  struct LazyList : SarnObject {
    LazyList() : SarnObject(543), itemsM(nullptr) {}
    VekGenericArray itemsM;
  } probe;
  const auto offset = reinterpret_cast<char*>(&probe.itemsM) - reinterpret_cast<char*>(static_cast<SarnObject*>(&probe));
  const FieldInfo field = {7, 42, {MakeTypeBits(SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY, SARN_ARITY_MULTI, 0)},
                           static_cast<uint16_t>(offset), 0, 0, 0};
  const StructInfo list = {"success", nullptr, 1, &field, nullptr, "items",
                           [](VekMempool* pool) { return ref<SarnObject>(new (pool) LazyList()); }};
  std::vector<const StructInfo*> defs(Schema::vStructDefG, Schema::vStructDefG + Schema::nStructDefG);
  defs[543] = &list;
  readerM.pStructDefsM = defs.data();
  const std::string text = "{\"type\": \"testAllTypes\", \"struct\": {\"items\": [ {\"a\":1} ,{ }, {\"b\":[{}]} ]}}";
  InputPointerBytesource first(reinterpret_cast<const unsigned char*>(text.data()), text.size());
  InputPointerBytesource second(reinterpret_cast<const unsigned char*>(text.data()), text.size());
  sarntest::StringSink outer;
  second.StartEcho(&outer);
  ref<SarnObject> object;
  VekString error;
  ASSERT_TRUE(readerM.JsonToSarnObject(first, second, 0, &object, error)) << Str(error);
  second.StopEcho();
  auto* items = &static_cast<LazyList*>(static_cast<sarnschema::TestAllTypes*>(object.Get())->structM.Get())->itemsM;
  std::string got = outer.textM + "|" + std::to_string(items->Count());
  for (int i = 0; i < items->Count(); ++i) {
    const auto* lazy = static_cast<LazyDict*>(items->Get(i));
    got += "|" + Captured(lazy) + " " + Str(lazy->ToJson(false)) + " " + Str(lazy->ToJson(true));
  }
  // Written again: compact and pretty through the streaming parser's Dictionary.
  EXPECT_EQ(got, text + "|3|{\"a\":1} {\"a\": 1} {\n    \"a\": 1\n}|{ } {} {\n}|{\"b\":[{}]} {\"b\": [{}]} "
                        "{\n    \"b\": [\n        {\n        }\n    ]\n}");
}

// A text whose containers nest `levels` deep (the top object is the first): objects, arrays or
// both under an unknown member, objects in a free-form value, both in a lazy member.
std::string Nested(const std::string& style, int levels) {
  std::string text = style == "lazy"   ? "{\"type\": \"kernoRpcRequest\", \"request\": "
                     : style == "free" ? "{\"type\": \"testAllTypes\", \"anyDict\": "
                                       : "{\"type\": \"success\", \"x\": ";
  std::string close = "}";
  for (int i = 1; i < levels; ++i) {
    bool isArray = style == "array" || (style != "free" && style != "object" && i % 2 == 1 && i > 1);
    text += isArray ? "[" : "{\"a\": ";
    close = (isArray ? "]" : "}") + close;
  }
  return text + "\"1\"" + close;
}

TEST_F(JsonReadTest, LimitsOfDepthObjectsAndElementsAtTheirEdges) {
  sarntest::RunOnStack(256 * 1024, [&] {
    for (const char* style : {"object", "array", "mixed", "free", "lazy"}) {
      std::string fits = Nested(style, Limits::kDefaultMaxDepth), deep = Nested(style, Limits::kDefaultMaxDepth + 1);
      VekString error;
      EXPECT_EQ(std::string(Dictionary::FromJson(VekString(fits.c_str()), error, &poolM) ? "read" : "refused") +
                    (Dictionary::FromJson(VekString(deep.c_str()), error, &poolM) ? " read " : " refused ") +
                    Memory(fits).substr(0, 1) + Memory(deep).substr(0, 52),
                "read refused {!JSON nesting exceeds the depth limit of 512 levels.") << style;
    }
  });
  // 65,535 objects (the top one and the array's) and elements fit; one more is refused.
  std::string objects = "{\"type\": \"testAllTypes\", \"knownDictMulti\": [{}", ints = "{\"type\": \"testAllTypes\", \"intMulti\": [0";
  for (int i = 2; i < 65535; ++i) objects += ",{}";
  for (int i = 1; i < 65535; ++i) ints += ",1";
  const std::string words = " failed to UnmarshalOneMultiValue in AVReadFieldValue Failed to parse an array member. Failed to parse value for key ";
  EXPECT_EQ(Memory(objects + "]}").substr(0, 1) + Memory(ints + "]}").substr(0, 1), "{{");
  EXPECT_EQ(Memory(objects + ",{}]}"), "!JSON text holds more than 65535 objects." + words + "knownDictMulti");
  EXPECT_EQ(Memory(ints + ",2]}"), "!JSON array holds more than 65535 elements." + words + "intMulti");
}

}  // namespace
