// Objects to Dictionary trees and back: the worked address both ways, every failure message with
// its exact joined text, the version choice with older records, the depth bound, and round trips
// of filled objects through JSON text, trees and the trees' text.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/ObjectFill.h"
#include "testutil/TestUtil.h"

namespace {

using namespace sarn;
using sarntest::Str;

class DictionaryObjectTest : public sarntest::PoolTest {
 protected:
  DictionaryObjectTest() : converterM(&poolM, Schema::vStructDefG, Schema::nStructDefG) {}

  ref<Dictionary> Parse(const std::string& json) {
    VekString error;
    ref<Dictionary> dictionary = Dictionary::FromJson(VekString::FromUtf8Bytes(&poolM, json.size(), json.data()), error, &poolM);
    EXPECT_TRUE(dictionary != nullptr) << error.Utf8();
    return dictionary;
  }
  // The converter's message for `tree` read at `version`, or "ok".
  std::string Read(const ref<Dictionary>& tree, KernoVersion version, ref<SarnObject>* out = nullptr,
                   const JsonLimits& limits = JsonLimits()) {
    ref<SarnObject> object;
    VekString error;
    if (!converterM.DictionaryToSarnObject(tree, version, object, error, limits)) {
      EXPECT_TRUE(object == nullptr);
      return Str(error);
    }
    if (out != nullptr) *out = object;
    return "ok";
  }
  std::string Read(const std::string& json, KernoVersion version, ref<SarnObject>* out = nullptr) {
    return Read(Parse(json), version, out);
  }
  std::string Json(const SarnObject* object, KernoVersion version) {
    return Str(JsonSarnObject(&poolM).SarnObjectToJson(object, version));
  }
  std::string Tree(const SarnObject* object, KernoVersion version) {
    return Str(converterM.SarnObjectToDictionary(object, version)->ToJson(false));
  }
  // The object's JSON text read back through a Dictionary, its own tree, and that tree's text
  // all write the same text again.
  void ExpectRoundTrips(const SarnObject* object, KernoVersion version) {
    const std::string text = Json(object, version);
    ref<Dictionary> tree = converterM.SarnObjectToDictionary(object, version);
    for (const ref<Dictionary>& source : {Parse(text), tree, Parse(Str(tree->ToJson(false)))}) {
      ref<SarnObject> back;
      ASSERT_EQ(Read(source, version, &back), "ok");
      EXPECT_EQ(Json(back.Get(), version), text);
    }
  }

  DictionarySarnObject converterM;
};

// The JSON writer and the tree give the same text here; a street2 without its flag is not written.
TEST_F(DictionaryObjectTest, WorkedAddressBothWays) {
  ref<SarnObject> address = sarntest::MakeWorkedAddress(&poolM);
  static_cast<sarnschema::Address*>(address.Get())->street2M = "not written";
  const std::string text =
      "{\"addressId\": \"vask:ds.7\", \"city\": \"Oslo\", \"country\": \"NO\", \"levelOfDetail\": \"high\", "
      "\"postalCode\": \"0150\", \"state\": \"\", \"street1\": \"Main St 1\", \"type\": \"address\"}";
  EXPECT_EQ(Tree(address.Get(), 42) + "\n" + Json(address.Get(), 42), text + "\n" + text);
  ref<SarnObject> back;
  ASSERT_EQ(Read(converterM.SarnObjectToDictionary(address.Get(), 42), 42, &back), "ok");
  EXPECT_TRUE(Json(back.Get(), 0) == Json(address.Get(), 0) && !static_cast<sarnschema::Address*>(back.Get())->fHasStreet2M);
  // A missing required field fails at a version and is left empty without one.
  const std::string noCity = "{\"addressId\": \"vask:ds.7\", \"type\": \"address\"}";
  EXPECT_EQ(Read(noCity, 42), "Required field not set: city");
  EXPECT_TRUE(Read(noCity, 0, &back) == "ok" && static_cast<sarnschema::Address*>(back.Get())->cityM.NByte() == 0);
}

TEST_F(DictionaryObjectTest, FailureMessagesJoinFromTheInsideOut) {
  for (const auto& row : sarntest::ReadTable("objects/dictionary-refusals.txt", 3)) {
    EXPECT_EQ(Read(row[1], static_cast<KernoVersion>(std::stoi(row[0]))), row[2]) << row[1];
  }
}

TEST_F(DictionaryObjectTest, ScalarFailuresReplaceEarlierTextAndOthersAppend) {
  ref<SarnObject> object = sarnschema::TestAllTypes::Factory(&poolM);
  const FieldInfo& boolean = sarnschema::TestAllTypes::vFieldInfoG[4];
  const FieldInfo& text = sarnschema::TestAllTypes::vFieldInfoG[52];
  ASSERT_TRUE(boolean.dataType == SARN_DATA_TYPE_BOOL && text.dataType == SARN_DATA_TYPE_STRING);
  FieldInfo odd = text;
  odd.typeBits = MakeTypeBits(SARN_DATA_TYPE_PLACEHOLDER, SARN_ARITY_REQUIRED, 0);
  const struct {
    const FieldInfo* field;
    ref<DictValue> value;
    const char* error;
  } cases[] = {
      {&boolean, StringValue::Make("yes", &poolM), "Cannot convert field"},
      {&text, ref<DictValue>(new (&poolM) NullValue()), "earlier Dictionary field is not a single string"},
      {&odd, StringValue::Make("x", &poolM), "earlier unhandled data type: 21"},
  };
  for (const auto& c : cases) {
    VekString error("earlier ");
    EXPECT_FALSE(converterM.DictToSingleField(c.field, c.value, object.Get(), error, 0));
    EXPECT_EQ(Str(error), c.error);
  }
  FieldInfo noTarget = sarnschema::TestAllTypes::vFieldInfoG[31];
  ASSERT_EQ(noTarget.dataType, SARN_DATA_TYPE_INT_ID);
  noTarget.refIndex = 0;
  unsigned int id = 99;
  VekString error;
  EXPECT_TRUE(!DictionarySarnObject::StringToIntId(&poolM, &noTarget, VekString("vask:rc.5"), error, id) &&
              Str(error) + " " + std::to_string(id) == "no struct for idbad prefix: vask:rc.5 99") << Str(error);

  // The byte forms give the string forms' values and messages, reading only their n bytes (a
  // digit follows them here) and, like the string forms, numbers only up to a NUL.
  using D = DictionarySarnObject;
  const std::string nul(1, '\0');
  const StructInfo* info = object->GetStructInfo();
  const FieldInfo* ids[3] = {&sarntest::FieldNamed(info, "idInt"), &sarntest::FieldNamed(info, "idLong"),
                             &sarntest::FieldNamed(info, "idString")};
  for (std::string text : std::vector<std::string>{"vask:rc.17", "vask:rc.17" + nul + "9", "vask:r", "", "vask:of.x1",
                                                  "vask:ct.tms.ep.12", "vask:rc." + std::string(70, '1'),
                                                  "vask:ct.tms.ep.1" + nul + "2"}) {
    VekString whole = VekString::FromUtf8Bytes(&poolM, text.size(), text.data()), errors[6], strings[2];
    const char* p = (text += "7").data();
    size_t n = text.size() - 1;
    unsigned int ints[2] = {5, 5};
    unsigned long long longs[2] = {5, 5};
    bool verdicts[6] = {D::StringToIntId(&poolM, ids[0], whole, errors[0], ints[0]),
                        D::StringToIntId(&poolM, ids[0], p, n, errors[1], ints[1]),
                        D::StringToLongId(&poolM, ids[1], whole, errors[2], longs[0]),
                        D::StringToLongId(&poolM, ids[1], p, n, errors[3], longs[1]),
                        D::StringToStringId(&poolM, ids[2], whole, errors[4], strings[0]),
                        D::StringToStringId(&poolM, ids[2], p, n, errors[5], strings[1])};
    for (int i = 0; i < 6; i += 2) EXPECT_TRUE(verdicts[i] == verdicts[i + 1] && errors[i] == errors[i + 1]) << i;
    EXPECT_TRUE(ints[0] == ints[1] && longs[0] == longs[1] && strings[0] == strings[1]) << text;
  }
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
  ASSERT_TRUE(t->stringMultiM.Count() == 1 && t->enumMultiM.Count() == 2);
  EXPECT_EQ(Str(t->stringM) + "|" + Str(t->stringMultiM.Get(0)) + "|" + Str(t->idStringM), "one|single|x1");
  EXPECT_EQ(std::vector<long long>({t->idIntM, t->fHasIdIntOptionalM, t->idIntOptionalM, t->intM, t->longM,
                                    *static_cast<uint32_t*>(t->enumMultiM.Get(1)), t->booleanM,
                                    t->dateTimeM.millisecondsM}),
            std::vector<long long>({17, 1, 0, -2147483648LL, 12, 6, 1, 1614863109000LL}));
  EXPECT_EQ(t->idLongM, (5ull << 48) + 12);
}

TEST_F(DictionaryObjectTest, ObjectToDictionaryLeavesOutWhatIsAbsent) {
  ref<SarnObject> success = sarnschema::Success::Factory(&poolM);
  EXPECT_EQ(Tree(success.Get(), 42), "{\"type\": \"success\"}");
  ref<SarnObject> object = sarnschema::TestAllTypes::Factory(&poolM);
  auto* t = static_cast<sarnschema::TestAllTypes*>(object.Get());
  t->structMultiM.Add(nullptr);
  t->structMultiM.Add(success.Get());
  t->unionMultiM.Add(nullptr);
  t->enumOptionalM = 7;
  t->fHasEnumOptionalM = true;
  // Null references and empty arrays are left out; an array of only nulls is no array; an enum
  // value without a name is written as such (and the reader refuses it).
  EXPECT_EQ(Tree(t, 0),
            "{\"boolean\": false, \"bytestring\": \"\", \"channelNumber\": \"invalid\", \"currency\": \"invalid\", "
            "\"date\": \"1970-01-01\", \"dateTime\": \"1970-01-01 00:00:00\", \"enum\": \"sunday\", "
            "\"enumOptional\": \"INVALID_VALUE:7\", \"float\": \"0.0\", \"idAnyBody\": \"\", \"idBase64\": \"vask:ta.\", "
            "\"idBody\": \"\", \"idInt\": \"vask:rc.0\", \"idLong\": \"vask:ct.0\", \"idLongAndType\": \"\", "
            "\"idString\": \"vask:of.\", \"imageUrl\": \"\", \"int\": 0, \"long\": \"0\", \"string\": \"\", "
            "\"structMulti\": [{\"type\": \"success\"}], \"time\": \"00:00:00\", \"type\": \"testAllTypes\", "
            "\"uri\": \"\", \"url\": \"\"}");
  EXPECT_EQ(Read(converterM.SarnObjectToDictionary(t, 0), 0),
            "bad enum item nameCannot convert value for the field.. Bad single field: enumOptional");
}

TEST_F(DictionaryObjectTest, OlderRecordsServeTheirVersions) {
  const std::string json = "{\"type\": \"endUserMessage\", \"endUserMessageId\": \"vask:eum.5\"}";
  ref<SarnObject> v21, v22;
  ASSERT_EQ(Read(json, 21, &v21) + Read(json, 22, &v22), "okok");
  auto* older = static_cast<sarnschema::EndUserMessage*>(v21.Get());
  auto* current = static_cast<sarnschema::EndUserMessage*>(v22.Get());
  EXPECT_EQ(std::vector<uint64_t>({older->endUserMessageIdUpTo21M, older->fHasEndUserMessageIdM,
                                   current->endUserMessageIdM, current->fHasEndUserMessageIdM}),
            std::vector<uint64_t>({5, 0, 5, 1}));
  EXPECT_NE(Tree(older, 21).find("\"endUserMessageId\": \"vask:eum.5\""), std::string::npos);
  // At 21 the older record is required; at 22 the current one is optional.
  EXPECT_EQ(Read("{\"type\": \"endUserMessage\"}", 21), "Required field not set: endUserMessageId");
}

TEST_F(DictionaryObjectTest, NestingIsBoundedByTheReadersLimit) {
  auto nested = [](int levels) {
    std::string json;
    for (int i = 1; i < levels; ++i) json += "{\"type\": \"error\", \"cause\": ";
    return json + "{\"type\": \"error\"}" + std::string(levels - 1, '}');
  };
  EXPECT_EQ(Read(nested(JsonLimits::kDefaultMaxDepth), 0), "ok");
  // A tree one level deeper than any reader accepts, built by hand.
  ref<Dictionary> top = Dictionary::New(&poolM, VekString("error"));
  top->Add(VekString("cause"), Parse(nested(JsonLimits::kDefaultMaxDepth)));
  std::string expected = "Dictionary nesting exceeds the depth limit of 512 levels.";
  for (int i = 0; i < JsonLimits::kDefaultMaxDepth; ++i) expected += ". Can't unmarshal inner Dictionary. Bad single field: cause";
  EXPECT_EQ(Read(top, 0), expected);
  EXPECT_TRUE(Read(Parse(nested(3)), 0, nullptr, JsonLimits(3)) == "ok" && Read(Parse(nested(4)), 0, nullptr, JsonLimits(3)) != "ok");
  // Array elements count a level of their own, as in the JSON text.
  EXPECT_NE(Read(Parse("{\"type\": \"testAllTypes\", \"structMulti\": [{\"type\": \"success\"}]}"), 0, nullptr,
                 JsonLimits(2)),
            "ok");
}

TEST_F(DictionaryObjectTest, DeepObjectsBecomeDeepTrees) {
  const int kDepth = 100000;
  std::vector<ref<SarnObject>> chain;
  for (int i = 0; i < kDepth; ++i) {
    chain.push_back(sarnschema::Error::Factory(&poolM));
    if (i > 0) static_cast<sarnschema::Error*>(chain[i - 1].Get())->causeM = chain.back();
  }
  int levels = 0;
  for (ref<Dictionary> d = converterM.SarnObjectToDictionary(chain.front().Get(), 0); d; d = d->GetDictionary("cause")) ++levels;
  EXPECT_EQ(levels, kDepth);
  for (auto& link : chain) link.Reset();  // from the top, so that no destructor recurses
}

TEST_F(DictionaryObjectTest, FilledObjectsRoundTrip) {
  ref<SarnObject> all = sarnschema::TestAllTypes::Factory(&poolM);
  sarntest::FillObject(&poolM, all.Get(), 1, 3);
  const std::string text = Json(all.Get(), 0);
  for (const FieldInfo& field : sarnschema::TestAllTypes::vFieldInfoG) {  // every field is there
    const char* name = FieldName(all->GetStructInfo(), field);
    EXPECT_TRUE(field.arity == SARN_ARITY_NONE || text.find("\"" + std::string(name) + "\": ") != std::string::npos) << name;
  }
  ExpectRoundTrips(all.Get(), 0);
  for (unsigned id : {191u, 219u, 346u, 463u, 470u, 975u, 2416u}) {
    ref<SarnObject> object = StructInfoForId(id)->pFactory(&poolM);
    sarntest::FillObject(&poolM, object.Get(), id, 2);
    // The JSON writer does not consult older records and the Dictionary reader does, so JSON read
    // at a version that an older required record covers can miss that field: versions after them.
    for (KernoVersion version : {0, 30, 42}) {
      SCOPED_TRACE(std::to_string(id) + " at " + std::to_string(version));
      ExpectRoundTrips(object.Get(), version);
    }
  }
}

}  // namespace
