// Objects to Dictionary trees and back: the worked address both ways, every failure message with
// its exact joined text, the version choice with older records, and the depth bound.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/ObjectFill.h"
#include "testutil/TestUtil.h"

namespace {

using namespace sarn;

class DictionaryObjectTest : public sarntest::PoolTest {
 protected:
  DictionaryObjectTest() : converterM(&poolM, Schema::vStructDefG, Schema::nStructDefG) {}

  ref<Dictionary> Parse(const char* json) {
    VekString error;
    ref<Dictionary> dictionary = Dictionary::FromJson(VekString(json), error, &poolM);
    EXPECT_TRUE(dictionary != nullptr) << error.Utf8();
    return dictionary;
  }
  // The converter's message for `json` read at `version`, or "ok".
  std::string Read(const char* json, KernoVersion version, ref<SarnObject>* out = nullptr) {
    ref<SarnObject> object;
    VekString error;
    if (!converterM.DictionaryToSarnObject(Parse(json), version, object, error)) {
      EXPECT_TRUE(object == nullptr);
      return error.Utf8();
    }
    if (out != nullptr) *out = object;
    return "ok";
  }
  std::string ObjectJson(const SarnObject* object, KernoVersion version) {
    JsonSarnObject json(&poolM);
    VekString text = json.SarnObjectToJson(object, version);
    return std::string(text.Utf8(), text.NByte());
  }
  std::string TreeJson(const DictValue* value) {
    VekString text = value->ToJson(false);
    return std::string(text.Utf8(), text.NByte());
  }

  DictionarySarnObject converterM;
};

TEST_F(DictionaryObjectTest, WorkedAddressBothWays) {
  ref<SarnObject> object = sarntest::MakeWorkedAddress(&poolM);
  auto* address = static_cast<sarnschema::Address*>(object.Get());
  ref<Dictionary> tree = converterM.SarnObjectToDictionary(address, 42);
  const char* text =
      "{\"addressId\": \"vask:ds.7\", \"city\": \"Oslo\", \"country\": \"NO\", \"levelOfDetail\": \"high\", "
      "\"postalCode\": \"0150\", \"state\": \"\", \"street1\": \"Main St 1\", \"type\": \"address\"}";
  EXPECT_EQ(TreeJson(tree.Get()), text);

  ref<SarnObject> back;
  VekString error;
  ASSERT_TRUE(converterM.DictionaryToSarnObject(tree, 42, back, error)) << error.Utf8();
  EXPECT_EQ(ObjectJson(back.Get(), 0), ObjectJson(address, 0));
  EXPECT_FALSE(static_cast<sarnschema::Address*>(back.Get())->fHasStreet2M);

  tree->Remove("city");
  EXPECT_EQ(Read(TreeJson(tree.Get()).c_str(), 42), "Required field not set: city");
  ref<SarnObject> lenient;
  EXPECT_EQ(Read(TreeJson(tree.Get()).c_str(), 0, &lenient), "ok");
  EXPECT_EQ(static_cast<sarnschema::Address*>(lenient.Get())->cityM.NByte(), 0u);
}

TEST_F(DictionaryObjectTest, FailureMessagesJoinFromTheInsideOut) {
  struct Case {
    const char* json;
    KernoVersion version;
    const char* message;
  };
  const Case cases[] = {
      {"{\"type\": \"address\"}", 255,
       "Unmarshaling to SarnObject: given kerno version is out of range used in code generation: 255"},
      {"{\"type\": \"address\"}", 6,
       "Unmarshaling to SarnObject: given kerno version is out of range used in code generation: 6"},
      {"{\"city\": \"Oslo\"}", 0, "Dictionary has no 'type' field."},
      {"{\"type\": [\"address\"]}", 0, "Dictionary has no 'type' field."},
      {"{\"type\": \"nothing\"}", 0, "no such structure type: nothing"},
      {"{\"type\": \"address\", \"city\": [\"a\", \"b\"]}", 0, "Cannot convert array to single field: city"},
      {"{\"type\": \"address\", \"city\": []}", 0, "Cannot convert array to single field: city"},
      {"{\"type\": \"address\", \"city\": {}}", 0, "Dictionary field is not a single string. Bad single field: city"},
      {"{\"type\": \"address\", \"levelOfDetail\": \"High\"}", 0,
       "bad enum item nameCannot convert value for the field.. Bad single field: levelOfDetail"},
      {"{\"type\": \"address\", \"levelOfDetail\": null}", 0,
       "Field must be a single string. Bad single field: levelOfDetail"},
      {"{\"type\": \"testAllTypes\", \"idInt\": \"vask:ch.5\"}", 0,
       "wrong prefix on idbad prefix: vask:ch.5Cannot convert value for the field.. Bad single field: idInt"},
      {"{\"type\": \"testAllTypes\", \"boolean\": \"yes\"}", 0, "Cannot convert field. Bad single field: boolean"},
      {"{\"type\": \"testAllTypes\", \"int\": 2147483648}", 0, "Cannot convert field. Bad single field: int"},
      {"{\"type\": \"testAllTypes\", \"float\": \"x\"}", 0, "Cannot convert field. Bad single field: float"},
      {"{\"type\": \"testAllTypes\", \"int\": {}}", 0, "Dictionary field is not a single string. Bad single field: int"},
      {"{\"type\": \"testAllTypes\", \"anyDict\": \"x\"}", 0, "Field must be a Dictionary. Bad single field: anyDict"},
      {"{\"type\": \"testAllTypes\", \"struct\": {\"type\": \"success\", \"message\": {}}}", 0,
       "Dictionary field is not a single string. Bad single field: message. Can't unmarshal inner Dictionary. "
       "Bad single field: struct"},
      {"{\"type\": \"testAllTypes\", \"union\": {}}", 0,
       "Dictionary has no 'type' field.. Can't unmarshal inner Dictionary. Bad single field: union"},
      {"{\"type\": \"testAllTypes\", \"intMulti\": [1, \"x\"]}", 0,
       "Dictionary string cannot be converted to requested data type in SarnObject array. Bad multi field: intMulti"},
      {"{\"type\": \"testAllTypes\", \"enumMulti\": [\"monday\", \"someday\"]}", 0,
       "bad enum item nameBad value in field: . Bad multi field: enumMulti"},
      {"{\"type\": \"testAllTypes\", \"structMulti\": [{\"type\": \"nothing\"}]}", 0,
       "no such structure type: nothing Can't convert inner Dictionary to SarnObject. Bad multi field: structMulti"},
      {"{\"type\": \"testAllTypes\", \"stringMulti\": [\"a\", [\"b\"]]}", 0,
       "Dictionary field is not a single string. Bad multi field: stringMulti"},
      {"{\"type\": \"kernoRpcRequest\", \"request\": \"x\"}", 0,
       "Field must be a LazyDict or a Dictionary. Bad single field: request"},
  };
  for (const Case& c : cases) EXPECT_EQ(Read(c.json, c.version), c.message) << c.json;
}

TEST_F(DictionaryObjectTest, ScalarFailuresReplaceEarlierTextAndOthersAppend) {
  ref<SarnObject> object = sarnschema::TestAllTypes::Factory(&poolM);
  const FieldInfo& boolean = sarnschema::TestAllTypes::vFieldInfoG[4];
  const FieldInfo& text = sarnschema::TestAllTypes::vFieldInfoG[52];
  ASSERT_EQ(boolean.dataType, SARN_DATA_TYPE_BOOL);
  ASSERT_EQ(text.dataType, SARN_DATA_TYPE_STRING);
  VekString error("earlier ");
  EXPECT_FALSE(converterM.DictToSingleField(&boolean, StringValue::Make("yes", &poolM), object.Get(), error, 0));
  EXPECT_STREQ(error.Utf8(), "Cannot convert field");
  error = "earlier ";
  EXPECT_FALSE(converterM.DictToSingleField(&text, ref<DictValue>(new (&poolM) NullValue()), object.Get(), error, 0));
  EXPECT_STREQ(error.Utf8(), "earlier Dictionary field is not a single string");

  FieldInfo odd = text;
  odd.typeBits = MakeTypeBits(SARN_DATA_TYPE_PLACEHOLDER, SARN_ARITY_REQUIRED, 0);
  error = VekString();
  EXPECT_FALSE(converterM.DictToSingleField(&odd, StringValue::Make("x", &poolM), object.Get(), error, 0));
  EXPECT_STREQ(error.Utf8(), "unhandled data type: 21");

  FieldInfo noTarget = sarnschema::TestAllTypes::vFieldInfoG[31];
  ASSERT_EQ(noTarget.dataType, SARN_DATA_TYPE_INT_ID);
  noTarget.refIndex = 0;
  unsigned int id = 99;
  error = VekString();
  EXPECT_FALSE(DictionarySarnObject::StringToIntId(&poolM, &noTarget, VekString("vask:rc.5"), error, id));
  EXPECT_STREQ(error.Utf8(), "no struct for idbad prefix: vask:rc.5");
  EXPECT_EQ(id, 99u);
}

TEST_F(DictionaryObjectTest, ValuesThatConvert) {
  ref<SarnObject> object;
  ASSERT_EQ(Read("{\"type\": \"testAllTypes\", \"string\": [\"one\"], \"stringMulti\": \"single\", "
                 "\"idInt\": \"vask:rc.17\", \"idIntOptional\": \"vask:rc.abc\", \"idLong\": \"vask:ct.tms.ep.12\", "
                 "\"idString\": \"vask:of.x1\", \"int\": -2147483648, \"long\": \"12abc\", \"enumMulti\": [\"monday\", "
                 "\"saturday\"], \"boolean\": true, \"dateTime\": \"2021-03-04T13:05:09\", \"ignored\": {}}",
                 0, &object),
            "ok");
  auto* t = static_cast<sarnschema::TestAllTypes*>(object.Get());
  EXPECT_STREQ(t->stringM.Utf8(), "one");
  ASSERT_EQ(t->stringMultiM.Count(), 1);
  EXPECT_STREQ(t->stringMultiM.Get(0).Utf8(), "single");
  EXPECT_EQ(t->idIntM, 17u);
  EXPECT_TRUE(t->fHasIdIntOptionalM);
  EXPECT_EQ(t->idIntOptionalM, 0u);
  EXPECT_EQ(t->idLongM, (5ull << 48) + 12);
  EXPECT_STREQ(t->idStringM.Utf8(), "x1");
  EXPECT_EQ(t->intM, -2147483647 - 1);
  EXPECT_EQ(t->longM, 12);
  ASSERT_EQ(t->enumMultiM.Count(), 2);
  EXPECT_EQ(*static_cast<uint32_t*>(t->enumMultiM.Get(1)), 6u);
  EXPECT_TRUE(t->booleanM);
  EXPECT_EQ(t->dateTimeM.millisecondsM, 1614863109000LL);
}

TEST_F(DictionaryObjectTest, ObjectToDictionaryLeavesOutWhatIsAbsent) {
  ref<SarnObject> success = sarnschema::Success::Factory(&poolM);
  EXPECT_EQ(TreeJson(converterM.SarnObjectToDictionary(success.Get(), 42).Get()), "{\"type\": \"success\"}");

  ref<SarnObject> object = sarnschema::TestAllTypes::Factory(&poolM);
  auto* t = static_cast<sarnschema::TestAllTypes*>(object.Get());
  t->structMultiM.Add(nullptr);
  t->structMultiM.Add(success.Get());
  t->unionMultiM.Add(nullptr);
  t->enumOptionalM = 7;
  t->fHasEnumOptionalM = true;
  ref<Dictionary> tree = converterM.SarnObjectToDictionary(t, 0);
  EXPECT_EQ(TreeJson(tree->GetArray("structMulti").Get()), "[{\"type\": \"success\"}]");
  EXPECT_EQ(tree->CountValues("unionMulti"), 0u);
  EXPECT_EQ(tree->CountValues("knownDict"), 0u);
  EXPECT_EQ(tree->CountValues("intMulti"), 0u);
  EXPECT_EQ(TreeJson(tree.Get()).find("\"int\": 0"), TreeJson(tree.Get()).find("\"int\""));
  // An enum value without a name is written, and the reader refuses it.
  VekString error;
  ref<SarnObject> back;
  EXPECT_FALSE(converterM.DictionaryToSarnObject(tree, 0, back, error));
  EXPECT_STREQ(error.Utf8(), "bad enum item nameCannot convert value for the field.. Bad single field: enumOptional");
}

TEST_F(DictionaryObjectTest, OlderRecordsServeTheirVersions) {
  ref<SarnObject> v21;
  ref<SarnObject> v22;
  ASSERT_EQ(Read("{\"type\": \"endUserMessage\", \"endUserMessageId\": \"vask:eum.5\"}", 21, &v21), "ok");
  auto* older = static_cast<sarnschema::EndUserMessage*>(v21.Get());
  EXPECT_EQ(older->endUserMessageIdUpTo21M, 5u);
  EXPECT_FALSE(older->fHasEndUserMessageIdM);
  ASSERT_EQ(Read("{\"type\": \"endUserMessage\", \"endUserMessageId\": \"vask:eum.5\"}", 22, &v22), "ok");
  auto* current = static_cast<sarnschema::EndUserMessage*>(v22.Get());
  EXPECT_EQ(current->endUserMessageIdM, 5u);
  EXPECT_TRUE(current->fHasEndUserMessageIdM);
  EXPECT_NE(TreeJson(converterM.SarnObjectToDictionary(older, 21).Get()).find("\"endUserMessageId\": \"vask:eum.5\""),
            std::string::npos);
  // At 21 the older record is required; at 22 the current one is optional.
  EXPECT_EQ(Read("{\"type\": \"endUserMessage\"}", 21).rfind("Required field not set: ", 0), 0u);
}

TEST_F(DictionaryObjectTest, NestingIsBoundedByTheReadersLimit) {
  auto nested = [](int levels) {
    std::string json;
    for (int i = 1; i < levels; ++i) json += "{\"type\": \"error\", \"cause\": ";
    json += "{\"type\": \"error\"}";
    for (int i = 1; i < levels; ++i) json += "}";
    return json;
  };
  ref<SarnObject> object;
  EXPECT_EQ(Read(nested(JsonLimits::kDefaultMaxDepth).c_str(), 0, &object), "ok");
  // A tree one level deeper than any reader accepts, built by hand.
  ref<Dictionary> top = Dictionary::New(&poolM, VekString("error"));
  top->Add(VekString("cause"), Parse(nested(JsonLimits::kDefaultMaxDepth).c_str()));
  VekString error;
  EXPECT_FALSE(converterM.DictionaryToSarnObject(top, 0, object, error));
  std::string expected = "Dictionary nesting exceeds the depth limit of 512 levels.";
  for (int i = 0; i < JsonLimits::kDefaultMaxDepth; ++i) {
    expected += ". Can't unmarshal inner Dictionary. Bad single field: cause";
  }
  EXPECT_EQ(error.Utf8(), expected);

  error = VekString();
  EXPECT_TRUE(converterM.DictionaryToSarnObject(Parse(nested(3).c_str()), 0, object, error, JsonLimits(3)));
  EXPECT_FALSE(converterM.DictionaryToSarnObject(Parse(nested(4).c_str()), 0, object, error, JsonLimits(3)));
  // Array elements count a level of their own, as in the JSON text.
  EXPECT_FALSE(converterM.DictionaryToSarnObject(
      Parse("{\"type\": \"testAllTypes\", \"structMulti\": [{\"type\": \"success\"}]}"), 0, object, error,
      JsonLimits(2)));
}

TEST_F(DictionaryObjectTest, DeepObjectsBecomeDeepTrees) {
  const int kDepth = 100000;
  std::vector<ref<SarnObject>> chain;
  for (int i = 0; i < kDepth; ++i) {
    chain.push_back(sarnschema::Error::Factory(&poolM));
    if (i > 0) static_cast<sarnschema::Error*>(chain[i - 1].Get())->causeM = chain.back();
  }
  ref<Dictionary> tree = converterM.SarnObjectToDictionary(chain.front().Get(), 0);
  int levels = 0;
  for (ref<Dictionary> d = tree; d != nullptr; d = d->GetDictionary("cause")) ++levels;
  EXPECT_EQ(levels, kDepth);
  for (auto& link : chain) link.Reset();
}

}  // namespace
