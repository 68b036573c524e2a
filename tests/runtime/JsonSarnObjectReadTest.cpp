// The JSON-to-object reader: the table of texts with their outcomes (read from memory and from
// byte sources in pieces of 1, 7 and 16,384 bytes, which must agree), the free-form reader's own
// messages, lazy capture across block boundaries, depth and count limits at their edges, and
// objects of every type written, read and written again.
#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "sarn/Sarn.h"
#include "testutil/RandomObject.h"
#include "testutil/TestUtil.h"

namespace {

using namespace sarn;
using sarntest::PieceSource;
using sarntest::Str;

std::string Join(const ref<Dictionary>& dictionary) {
  if (!dictionary) return "unparsable expectation";
  std::string out;
  VekStringArray names(nullptr);
  dictionary->GetSortedNames(names);
  for (int i = 0; i < names.Count(); ++i) {
    ref<DictValue> value = dictionary->Get(names[i]);
    out += Str(names[i]) + "=" + (value->kindM == DictValue::KIND_NULL ? "absent" : Str(value->ToJson(false))) + " ";
  }
  return out;
}

class JsonReadTest : public sarntest::PoolTest {
 protected:
  // "! message" for a refusal (the result must then be null), else the written object.
  std::string Outcome(bool isOk, const ref<SarnObject>& object, const VekString& error) {
    if (!isOk) return std::string(object ? "result kept: " : "! ") + Str(error);
    return Str(JsonSarnObject(&poolM).SarnObjectToJson(object.Get(), 0));
  }
  std::string Memory(const std::string& text, KernoVersion version = 0) {
    ref<SarnObject> object = sarnschema::Success::Factory(&poolM);  // a stale result must be cleared
    VekString error;
    bool isOk = readerM.JsonToSarnObject(reinterpret_cast<const unsigned char*>(text.data()),
                                         static_cast<int>(text.size()), version, &object, error);
    return Outcome(isOk, object, error);
  }
  std::string Source(const std::string& text, size_t piece) {
    PieceSource::Counters counters;
    PieceSource source(std::make_shared<const std::string>(text), piece, &counters);
    ref<SarnObject> object;
    VekString error;
    size_t bytesRead = 0;
    bool isOk = readerM.JsonToSarnObject(&source, bytesRead, 0, &object, error);
    EXPECT_EQ(counters.nDuplicatedM, 2);
    EXPECT_EQ(counters.nDeletedM, 2);
    EXPECT_EQ(source.Position(), 0u);
    if (isOk && text.back() == '}') {
      EXPECT_EQ(bytesRead, text.size()) << piece;
    }
    return Outcome(isOk, object, error);
  }
  // The members of the written object that `expected` names, as "name=json" (absent for null).
  std::string Project(const std::string& written, const std::string& expected) {
    VekString error;
    ref<Dictionary> want = Dictionary::FromJson(VekString(expected.c_str()), error, &poolM);
    ref<Dictionary> got = Dictionary::FromJson(VekString(written.c_str()), error, &poolM);
    if (!want || !got) return "unparsable: " + written;
    ref<Dictionary> picked = Dictionary::New(&poolM, VekString());
    VekStringArray names(nullptr);
    want->GetSortedNames(names);
    for (int i = 0; i < names.Count(); ++i) {
      ref<DictValue> value = got->Get(names[i]);
      picked->Add(names[i], value ? value : ref<DictValue>(new (&poolM) NullValue()));
    }
    return Join(picked);
  }
  ref<Dictionary> Parse(const std::string& text) {
    VekString error;
    return Dictionary::FromJson(VekString(text.c_str()), error, &poolM);
  }

  JsonSarnObject readerM{&poolM};
};

TEST_F(JsonReadTest, TableOfTextsAgreesThroughEveryEntryPoint) {
  for (const auto& row : sarntest::ReadTable("json/object-reads.txt", 2)) {
    const std::string& text = row[0];
    std::string got = Memory(text);
    for (size_t piece : {1, 7, 16384}) EXPECT_EQ(Source(text, piece), got) << text << " in pieces of " << piece;
    if (row[1][0] == '!') {
      EXPECT_EQ(got, row[1]) << text;
    } else {
      EXPECT_EQ(Project(got, row[1]), Join(Parse(row[1]))) << text << "\n  wrote " << got;
    }
  }
}

TEST_F(JsonReadTest, MissingTypeLeavesErrorUntouchedAndVersionRestrictsNothing) {
  for (const char* text : {"{}", "{\"type\": \"nothing\", \"a\": 1}", "{\"inner\": {\"type\": \"success\"}}"}) {
    ref<SarnObject> object = sarnschema::Success::Factory(&poolM);
    VekString error("before");
    EXPECT_FALSE(readerM.JsonToSarnObject(reinterpret_cast<const unsigned char*>(text), static_cast<int>(strlen(text)),
                                          0, &object, error));
    EXPECT_EQ(Str(error), "before");
    EXPECT_FALSE(object);
  }
  // isVisible is carried from version 9 on; a read at version 7 still takes it.
  EXPECT_EQ(Memory("{\"type\": \"syncDeltaInternal\", \"isVisible\": true}", 7),
            "{\"type\": \"syncDeltaInternal\", \"isVisible\": true}");
  EXPECT_EQ(Memory("{}", 0), "! ");
  VekString error;
  EXPECT_FALSE(readerM.JsonToSarnObject(reinterpret_cast<const unsigned char*>("{}"), -1, 0, nullptr, error));
  EXPECT_EQ(Str(error), "Negative JSON length.");
  sarntest::TestSource undup({"{}"});
  size_t bytesRead = 0;
  EXPECT_FALSE(readerM.JsonToSarnObject(&undup, bytesRead, 0, nullptr, error));
  EXPECT_EQ(Str(error), "Negative JSON length.Byte source cannot be duplicated.");
  EXPECT_EQ(undup.nReadM, 0);
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
std::string Captured(const SarnObject* object) {
  const auto* request = static_cast<const sarnschema::KernoRpcRequest*>(object);
  const LazyDict* lazy = request->requestM.Get();
  if (lazy == nullptr || lazy->repM != LazyDict::REP_BYTESOURCE || lazy->versionM != 0) return "no capture";
  std::unique_ptr<wynbaselib::Bytesource> copy(lazy->pBytesourceM->Duplicate());
  std::string out;
  char buffer[1000];
  for (size_t n; (n = copy->Read(buffer, sizeof buffer)) != 0;) out.append(buffer, n);
  return out;
}

TEST_F(JsonReadTest, LazyMembersKeepTheirExactBytesAcrossBlockBoundaries) {
  const std::string member = "{ \"type\" :\"success\",\n\t\"message\": \"a\\\"b\" , \"x\": [{}, {\"y\": 1}] ,}";
  for (int shift = -8; shift <= 8; ++shift) {
    std::string head = "{\"type\": \"kernoRpcRequest\", \"rpcId\": 4, \"pad\": \"";
    head += std::string(16384 + shift - head.size() - 16, 'p') + "\",  \"request\":  ";
    std::string text = head + member + " , \"kernoVersion\": 9}";
    ASSERT_EQ(head.size(), 16384u + shift);
    ref<SarnObject> object;
    VekString error;
    ASSERT_TRUE(readerM.JsonToSarnObject(reinterpret_cast<const unsigned char*>(text.data()),
                                         static_cast<int>(text.size()), 0, &object, error));
    EXPECT_EQ(Captured(object.Get()), member) << shift;
    for (size_t piece : {7, 16384}) {
      PieceSource source(std::make_shared<const std::string>(text), piece);
      size_t bytesRead;
      ASSERT_TRUE(readerM.JsonToSarnObject(&source, bytesRead, 0, &object, error));
      EXPECT_EQ(Captured(object.Get()), member) << shift << " " << piece;
      EXPECT_EQ(static_cast<sarnschema::KernoRpcRequest*>(object.Get())->kernoVersionM, 9);
    }
  }
}

TEST_F(JsonReadTest, ArraysOfLazyMembersAndAnEchoAlreadyRunning) {
  // A hand-made type with a lazy array, reached as the subdict of testAllTypes' "struct".
  struct LazyList : SarnObject {
    LazyList() : SarnObject(543), itemsM(nullptr) {}
    VekGenericArray itemsM;
  };
  LazyList probe;
  const auto offset = reinterpret_cast<char*>(&probe.itemsM) - reinterpret_cast<char*>(static_cast<SarnObject*>(&probe));
  const FieldInfo kField = {7, 42, {MakeTypeBits(SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY, SARN_ARITY_MULTI, 0)},
                            static_cast<uint16_t>(offset), 0, 0, 0};
  const StructInfo kList = {"success", nullptr, 1, &kField, nullptr, "items",
                                   [](VekMempool* pool) { return ref<SarnObject>(new (pool) LazyList()); }};
  std::vector<const StructInfo*> defs(Schema::vStructDefG, Schema::vStructDefG + Schema::nStructDefG);
  defs[543] = &kList;
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
  EXPECT_EQ(outer.textM, text);
  auto* list = static_cast<LazyList*>(static_cast<sarnschema::TestAllTypes*>(object.Get())->structM.Get());
  ASSERT_EQ(list->itemsM.Count(), 3);
  std::string got;
  for (int i = 0; i < 3; ++i) {
    std::unique_ptr<wynbaselib::Bytesource> copy(static_cast<LazyDict*>(list->itemsM.Get(i))->pBytesourceM->Duplicate());
    char buffer[64];
    got += std::string(buffer, copy->Read(buffer, sizeof buffer)) + "|";
  }
  EXPECT_EQ(got, "{\"a\":1}|{ }|{\"b\":[{}]}|");
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

TEST_F(JsonReadTest, DepthAtTheLimitIsReadAndOneMoreIsRefusedByAllReaders) {
  const int limit = Limits::kDefaultMaxDepth;
  const std::string message = "JSON nesting exceeds the depth limit of 512 levels.";
  sarntest::RunOnStack(256 * 1024, [&] {
    for (const char* style : {"object", "array", "mixed", "free", "lazy"}) {
      std::string fits = Nested(style, limit), deep = Nested(style, limit + 1);
      VekString error;
      EXPECT_TRUE(Dictionary::FromJson(VekString(fits.c_str()), error, &poolM)) << style << Str(error);
      EXPECT_FALSE(Dictionary::FromJson(VekString(deep.c_str()), error, &poolM)) << style;
      EXPECT_EQ(Memory(fits).substr(0, 1), "{") << style;
      std::string refused = Memory(deep);
      EXPECT_EQ(refused.substr(0, 2 + message.size()), "! " + message) << style << refused;
    }
  });
}

TEST_F(JsonReadTest, ObjectAndElementCountsAtThePlatformLimit) {
  auto objects = [](int n) {
    std::string text = "{\"type\": \"testAllTypes\", \"knownDictMulti\": [";
    for (int i = 1; i < n; ++i) text += i == 1 ? "{}" : ",{}";
    return text + "]}";
  };
  std::string read = Memory(objects(65535));
  EXPECT_EQ(read.substr(0, 1), "{");
  EXPECT_EQ(Memory(objects(65536)),
            "! JSON text holds more than 65535 objects. failed to UnmarshalOneMultiValue in AVReadFieldValue Failed to "
            "parse an array member. Failed to parse value for key knownDictMulti");
  std::string ints = "{\"type\": \"testAllTypes\", \"intMulti\": [0";
  for (int i = 1; i < 65535; ++i) ints += ",1";
  EXPECT_EQ(Memory(ints + "]}").substr(0, 1), "{");
  EXPECT_EQ(Memory(ints + ",2]}"),
            "! JSON array holds more than 65535 elements. failed to UnmarshalOneMultiValue in AVReadFieldValue Failed "
            "to parse an array member. Failed to parse value for key intMulti");
}

bool HasLazyField(const StructInfo* info) {
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    if (info->vFieldInfo[n].dataType == SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY) return true;
  }
  return false;
}

TEST_F(JsonReadTest, RandomObjectsOfEveryTypeReadBackAsWritten) {
  // An empty free-form dictionary is written as {}, which the free-form reader refuses: such
  // texts must be refused, every other one read back to the same text.
  sarntest::RandomObjects random(&poolM, 14, {543, 1259}, 3);
  int nSame = 0;
  for (unsigned round = 0; round < 300; ++round) {
    unsigned typeId = round % 3 == 0 ? 1259 : static_cast<unsigned>(1 + random.Next(1271));
    ref<SarnObject> object = random.Make(typeId);
    if (!object || HasLazyField(object->GetStructInfo())) continue;
    std::string text = Str(JsonSarnObject(&poolM).SarnObjectToJson(object.Get(), 0));
    std::string again = Memory(text);
    if (text.find("{}") != std::string::npos && again[0] == '!') continue;
    EXPECT_EQ(again, text) << "type " << typeId;
    ++nSame;
  }
  EXPECT_GT(nSame, 30);
}

}  // namespace
