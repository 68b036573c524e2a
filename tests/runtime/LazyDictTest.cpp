// LazyDict for the Dict, JSON and Dictionary forms, and the answers of the forms converted by the
// object layer (the same as an unknown representation until that layer exists).
#include "runtime/DictTestSupport.h"

namespace {

using namespace dicttest;
using LazyDictTest = sarntest::PoolTest;

// The type name a payload reports, in brackets, or "none".
std::string Name(const ref<LazyDict>& payload) {
  VekString name("stale");
  return payload->GetTypeName(&name) ? "[" + Str(name) + "]" : "none";
}

TEST_F(LazyDictTest, FirstByteChoosesTheForm) {
  // A '{' (after blanks) is JSON, anything else protocol-buffer bytes; nothing, or a NUL first, no payload.
  std::string forms;
  for (const char* text : {"{}", " {}", "\n{}", "[1]", ""}) {
    ref<LazyDict> payload = LazyDict::FromJsonString(&poolM, VekString(text), 7);
    forms += !payload ? "none " : payload->repM == LazyDict::REP_JSON ? "json " : payload->repM == LazyDict::REP_PROTOBUF ? "pb " : "? ";
  }
  EXPECT_EQ(forms, "json json pb pb none ");
  EXPECT_FALSE(LazyDict::FromBytestring(&poolM, vek::ByteBuffer::New(&poolM, "\0{", 2), 7));
  EXPECT_FALSE(LazyDict::FromBytestring(&poolM, ref<vek::ByteBuffer>(), 7));
  ref<vek::ByteBuffer> bytes = vek::ByteBuffer::New(&poolM, "\x7B\x08\x01", 3);
  ref<LazyDict> payload = LazyDict::FromBytestring(&poolM, bytes, 9);
  EXPECT_EQ(payload->repM, LazyDict::REP_JSON) << "only the first byte decides";
  EXPECT_TRUE(payload->bytesM.Get() == bytes.Get() && payload->versionM == 9 && !payload->dictionaryM)
      << "the buffer is shared";
}

TEST_F(LazyDictTest, StoredJsonIsPassedOnAndParsedOnDemand) {
  ref<LazyDict> good = LazyDict::FromJsonString(&poolM, VekString("{\"type\":\"t\", \"b\" :[1]}"), 0);
  EXPECT_EQ(Str(good->ToJson(false)), "{\"type\":\"t\", \"b\" :[1]}") << "compact output is the stored text";
  EXPECT_EQ(good->ToJsonBytestring(false).Get(), good->bytesM.Get());
  EXPECT_EQ(Str(good->ToJson(true)), "{\n    \"b\": [\n        1\n    ], \n    \"type\": \"t\"\n}");
  VekString error;
  EXPECT_EQ(Compact(good->ToDictionary(error)), R"({"b": [1], "type": "t"})");
  EXPECT_EQ(Str(error), "");
  unsigned int typeId = 77;
  EXPECT_FALSE(good->GetType(&typeId)) << "type ids arrive with the object layer";

  ref<LazyDict> bad = LazyDict::FromJsonString(&poolM, VekString("{oops"), 0);
  EXPECT_EQ(Str(bad->ToJson(false)), "{oops");
  EXPECT_EQ(Str(bad->ToJson(true)), "{oops") << "stored text that does not parse is passed on unchanged";
  EXPECT_FALSE(bad->ToDictionary(error));
  EXPECT_EQ(Str(error), "JSON field name must be followed by a colon.");
  EXPECT_EQ(Str(bad->ToDict()->ToString(false)),
            R"({"code": "badArgument", "text": "JSON field name must be followed by a colon.", "type": "error"})");
  // A type that is not a string names nothing.
  EXPECT_EQ(Name(good) + Name(bad) + Name(LazyDict::FromJsonString(&poolM, VekString("{\"type\": {}}"), 0)) +
                Name(LazyDict::FromJsonString(&poolM, VekString("{}"), 0)),
            "[t]none[]none");
}

TEST_F(LazyDictTest, DictAndDictionaryFormsShareTheirTrees) {
  ref<Dict> dict = Dict::New(&poolM, VekString("thing"));
  dict->AddString("v", "1");
  ref<LazyDict> fromDict = LazyDict::FromDict(&poolM, dict, 3);
  EXPECT_EQ(fromDict->repM, LazyDict::REP_DICT);
  EXPECT_EQ(fromDict->ToDict().Get(), dict.Get());
  VekString error;
  EXPECT_EQ(fromDict->ToDictionary(error).Get(), dict->GetDictionary().Get());
  EXPECT_EQ(Str(fromDict->ToJson(false)), R"({"type": "thing", "v": "1"})");
  EXPECT_EQ(Name(fromDict), "[thing]");

  ref<LazyDict> fromDictionary = LazyDict::FromDictionary(&poolM, dict->GetDictionary(), 0);
  EXPECT_EQ(fromDictionary->repM, LazyDict::REP_DICTIONARY);
  EXPECT_EQ(fromDictionary->ToDictionary(error).Get(), dict->GetDictionary().Get());
  EXPECT_EQ(fromDictionary->ToDict()->GetDictionary().Get(), dict->GetDictionary().Get());
  wynbaselib::InMemoryBytestream sink;
  fromDictionary->ToJsonBytesink(sink, true);
  EXPECT_EQ(sink.GetContent(), Str(fromDictionary->ToJson(true)));

  // A Dict payload equals a JSON payload holding its compact text; any difference in the text
  // of the two trees makes them unequal.
  ref<LazyDict> asJson = LazyDict::FromJsonString(&poolM, dict->ToString(false), 0);
  EXPECT_TRUE(*fromDict == *asJson);
  EXPECT_FALSE(*fromDict != *asJson);
  EXPECT_TRUE(*fromDict != *LazyDict::FromJsonString(&poolM, VekString("{\"type\": \"thing\", \"v\": 1}"), 0));
  ref<LazyDict> other = LazyDict::FromDictionary(&poolM, Dictionary::New(&poolM, VekString("x")), 0);
  other->SetDictionary(dict->GetDictionary());
  EXPECT_EQ(other->repM, LazyDict::REP_DICTIONARY);
  EXPECT_TRUE(*other == *fromDict);
}

TEST_F(LazyDictTest, FormsOfTheObjectLayerAnswerAsUnknownForms) {
  int deleted = 0;
  std::vector<ref<LazyDict>> payloads = {
      LazyDict::FromBytesource(&poolM, new sarntest::TestSource({"{}"}, &deleted), 0),
      LazyDict::FromJsonString(&poolM, VekString("\x08\x01"), 0),
      LazyDict::New(&poolM, static_cast<LazyDict::Rep>(9), nullptr, nullptr, nullptr, nullptr, 0),
  };
  for (const ref<LazyDict>& payload : payloads) {
    VekString error;
    EXPECT_FALSE(payload->ToDictionary(error));
    EXPECT_EQ(Str(error), "LazyDict to Dictionary: unknown representation in LazyDict");
    EXPECT_EQ(Str(payload->ToDict()->ToString(false)),
              R"({"code": "internalError", "text": "bad rep in LazyDict", "type": "error"})");
    EXPECT_EQ(Str(payload->ToJson(false)) + Str(payload->ToJson(true)) + Name(payload), "none");
  }
  EXPECT_EQ(deleted, 0);
  payloads.clear();
  EXPECT_EQ(deleted, 1) << "the payload owns its byte source";
}

TEST_F(LazyDictTest, PayloadsInsideTreesWriteAndCompareAsPayloads) {
  ref<Dictionary> inner = Dictionary::New(&poolM, VekString("in"));
  ref<Dictionary> level3 = new (&poolM) Dictionary();
  level3->Add(VekString("p"), LazyDict::FromDictionary(&poolM, inner, 0));
  ref<ArrayValue> level2 = new (&poolM) ArrayValue();
  level2->Add(level3);
  ref<Dictionary> top = new (&poolM) Dictionary();
  top->Add(VekString("a"), level2);
  // The payload's own indentation starts again at depth 0.
  EXPECT_EQ(Pretty(top),
            "{\n    \"a\": [\n        {\n            \"p\": {\n    \"type\": \"in\"\n}\n        }\n    ]\n}");
  EXPECT_EQ(Compact(top), R"({"a": [{"p": {"type": "in"}}]})");

  ref<LazyDictValue> x = new (&poolM) LazyDictValue(LazyDict::FromJsonString(&poolM, VekString("{\"type\": \"in\"}"), 0));
  ref<LazyDictValue> y = new (&poolM) LazyDictValue(LazyDict::FromDictionary(&poolM, inner, 0));
  EXPECT_TRUE(x->Equals(y));
  EXPECT_FALSE(x->Equals(inner));
  ref<LazyDictValue> empty = new (&poolM) LazyDictValue();
  EXPECT_FALSE(x->Equals(empty));
  EXPECT_TRUE(empty->Equals(ref<LazyDictValue>(new (&poolM) LazyDictValue())));
  EXPECT_EQ(Compact(empty), "null");
  EXPECT_EQ(Str(LazyDictValue::EmptyValue(&poolM)->ToJson(false)), "{}");
}

}  // namespace
