// The object-to-JSON writer: exact bytes for every data type, the place of "type", version
// filtering at the edges of ranges, null references, and depth without limit (also for the
// binary writer, which walks objects the same way).
#include "runtime/ObjectOpsSupport.h"

namespace {

using namespace sarn;
using sarntest::Str;

// Objects of hand-made types: raw zeroed storage after the header, described by local tables.
class RawObject : public SarnObject {
 public:
  explicit RawObject(uint32_t typeId) : SarnObject(typeId) { std::memset(bytesM, 0, sizeof bytesM); }
  unsigned char bytesM[64];
};

FieldInfo Field(unsigned dataType, unsigned arity, unsigned offset, unsigned nameOffset, unsigned minVersion = 7,
                unsigned maxVersion = 42, unsigned refIndex = 0) {
  FieldInfo field = {};
  field.minVersion = static_cast<uint8_t>(minVersion);
  field.maxVersion = static_cast<uint8_t>(maxVersion);
  field.typeBits = MakeTypeBits(dataType, arity, 0);
  field.valueOffset = static_cast<uint16_t>(offset);
  field.refIndex = static_cast<uint16_t>(refIndex);
  field.nameOffset = static_cast<uint16_t>(nameOffset);
  return field;
}

StructInfo Struct(const char* name, const char* prefix, const std::vector<FieldInfo>& fields, const char* names) {
  return StructInfo{name, prefix, static_cast<uint16_t>(fields.size()), fields.data(), nullptr, names, nullptr};
}

class JsonWriteTest : public sarntest::PoolTest {
 protected:
  std::string Write(const SarnObject* object, KernoVersion version, const StructInfo* const* defs = nullptr,
                    uint32_t nDefs = 0) {
    JsonSarnObject json(&poolM);
    if (defs != nullptr) json.pStructDefsM = defs, json.nStructDefsM = nDefs;
    return sarntest::Str(json.SarnObjectToJson(object, version));
  }
};

// Type stands before the last field that sorts below it in the version; numbers and ids of
// hand-made types.
TEST_F(JsonWriteTest, HandMadeTypesFromTable) {
  const FieldInfo placeholder = {0, 0, {kPlaceholderTypeBits}, 0, 0, 0, 0};
  auto s32 = [](unsigned offset, unsigned nameOffset, unsigned minVersion = 7, unsigned maxVersion = 42) {
    return Field(SARN_DATA_TYPE_S32, SARN_ARITY_REQUIRED, offset, nameOffset, minVersion, maxVersion);
  };
  std::vector<FieldInfo> first = {placeholder, s32(24, 0), s32(28, 7), s32(32, 14)};
  std::vector<FieldInfo> after = {s32(24, 0), s32(28, 4)};
  std::vector<FieldInfo> ranged = {s32(24, 0, 7, 9), s32(28, 6)};  // apple up to 9: then nothing sorts below "type"
  std::vector<FieldInfo> edges = {s32(24, 0, 10, 20), s32(28, 2, 21, 42), s32(32, 4, 7, 7)};
  StructInfo a = Struct("a", nullptr, first, "bodyId\0number\0sourceProductDescription");
  StructInfo b = Struct("b", nullptr, after, "uri\0value");
  StructInfo c = Struct("c", nullptr, {}, "");
  StructInfo d = Struct("d", nullptr, ranged, "apple\0zebra");
  StructInfo zz = Struct("zz", nullptr, edges, "u\0v\0w");
  // Ids refer to the entries 0 (none), 6 (with a prefix) and 2 (without).
  std::vector<FieldInfo> numbers = {Field(SARN_DATA_TYPE_U32, SARN_ARITY_REQUIRED, 24, 0),
                                    Field(SARN_DATA_TYPE_U64, SARN_ARITY_REQUIRED, 32, 2),
                                    Field(SARN_DATA_TYPE_INT_ID, SARN_ARITY_REQUIRED, 28, 4, 7, 42, 0),
                                    Field(SARN_DATA_TYPE_INT_ID, SARN_ARITY_REQUIRED, 28, 6, 7, 42, 6),
                                    Field(SARN_DATA_TYPE_LONG_ID, SARN_ARITY_REQUIRED, 32, 8, 7, 42, 2),
                                    Field(SARN_DATA_TYPE_PLACEHOLDER, SARN_ARITY_REQUIRED, 24, 10)};
  StructInfo t = Struct("t", "vask:t.", numbers, "a\0b\0c\0d\0e\0f");
  const StructInfo* defs[] = {nullptr, &a, &b, &c, &d, &zz, &t};
  for (const auto& row : sarntest::ReadTable("json/type-placement.txt", 3)) {
    RawObject object(static_cast<uint32_t>(std::stoul(row[0])));
    std::memcpy(object.bytesM, "\x07\0\0\0\x07\0\0\0\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF", 16);
    EXPECT_EQ(Write(&object, static_cast<KernoVersion>(std::stoi(row[1])), defs, 7), row[2]) << row[0] << " at " << row[1];
  }
}

TEST_F(JsonWriteTest, FieldValuesFromTable) {
  for (const auto& row : sarntest::ReadTable("json/object-writes.txt", 3)) {
    const FieldInfo* field;
    const std::string json = Write(objopstest::Side(&poolM, row[0], row[1], field).Get(), 0);
    const std::string name = "\"" + row[0].substr(row[0].find('.') + 1) + "\": ";
    EXPECT_EQ(json.find(row[2] == "-" ? name : row[2]) == std::string::npos, row[2] == "-") << row[0] << ": " << json;
  }
  // Null elements of an array of objects are left out, and the commas stay right.
  ref<SarnObject> all = sarnschema::TestAllTypes::Factory(&poolM), object = sarnschema::Success::Factory(&poolM);
  for (SarnObject* element : {static_cast<SarnObject*>(nullptr), object.Get(), static_cast<SarnObject*>(nullptr)}) {
    static_cast<sarnschema::TestAllTypes*>(all.Get())->structMultiM.Add(element);
  }
  EXPECT_NE(Write(all.Get(), 0).find("\"structMulti\": [{\"type\": \"success\"}], \"time\""), std::string::npos);
}

// The writer forms dates, times and ids itself; they must be the bytes of the types' own text.
TEST_F(JsonWriteTest, DatesTimesAndIdsAreTheirOwnTextForms) {
  ref<SarnObject> object = sarnschema::TestAllTypes::Factory(&poolM);
  auto* t = static_cast<sarnschema::TestAllTypes*>(object.Get());
  auto expectOwnTexts = [&](long long value) {
    const std::string json = Write(t, 0);
    for (const std::string& member : {"\"date\": \"" + Str(t->dateM.ToString()), "\"dateTime\": \"" + Str(t->dateTimeM.ToString()),
                                      "\"time\": \"" + Str(t->timeM.ToString()),
                                      "\"idLong\": \"vask:ct." + Str(Dict::FormatLongId(&poolM, t->idLongM))}) {
      EXPECT_NE(json.find(member + "\""), std::string::npos) << member << " for " << value << " in " << json;
    }
  };
  for (long long d : {0LL, -1LL, 1LL, 59LL, 60LL, 365LL, 10957LL, 11016LL, -354286LL, -354285LL, 2932896LL, 2932897LL, -719528LL,
                      -25000000LL, 25000000LL, 2147483647LL, -2147483648LL}) {
    t->dateM = Date(static_cast<int32_t>(d));
    t->dateTimeM = DateTime(d * 86400000 + 45296789);
    t->timeM = Time(static_cast<int32_t>(d * 1000));
    t->idLongM = static_cast<uint64_t>(d);
    expectOwnTexts(d);
  }
  for (long long ms : {-1LL, -999LL, -1000LL, -1001LL, 86399999LL, 86400000LL, -86400001LL}) {
    t->dateTimeM = DateTime(ms);
    t->timeM = Time(static_cast<int32_t>(ms));
    expectOwnTexts(ms);
  }
  // Id texts are cut to 99 bytes as a 100-byte buffer would cut them.
  t->idStringM = VekString(std::string(120, 'x').c_str());
  EXPECT_NE(Write(t, 0).find("\"idString\": \"vask:of." + std::string(91, 'x') + "\""), std::string::npos);
}

// A payload holding an object is written under the payload's version, not the outer one (a
// payload holding text writes that text as it is: a row of the field table).
TEST_F(JsonWriteTest, PayloadObjectsAreWrittenInTheirOwnVersion) {
  ref<SarnObject> object = sarnschema::KernoRpcRequest::Factory(&poolM);
  ref<SarnObject> error = objopstest::FromJson(&poolM, R"({"type": "error", "traceInfo": {"a": "1"}})");
  for (KernoVersion version : {26, 27}) {  // traceInfo from version 27 on
    static_cast<sarnschema::KernoRpcRequest*>(object.Get())->requestM = LazyDict::FromSarnObject(&poolM, error, version);
    EXPECT_NE(Write(object.Get(), 42).find(version == 26 ? "\"request\": {\"code\": \"INVALID_VALUE:0\", \"text\": \"\", \"type\": \"error\"}"
                                                          : "\"text\": \"\", \"type\": \"error\", \"traceInfo\": {\"a\": \"1\"}}"),
              std::string::npos) << version;
  }
}

// A chain of errors 100,000 deep, each the cause of the next, through both writers that walk
// objects into bytes, exactly. With the writer's pool refusing the first growth of the walk's
// stack, each reports the failure instead of writing on.
TEST_F(JsonWriteTest, ObjectChainsOfAnyDepthAreWrittenByEveryWriter) {
  const int kDepth = 100000;
  std::vector<ref<SarnObject>> chain;
  for (int i = 0; i < kDepth; ++i) {
    chain.push_back(sarnschema::Error::Factory(&poolM));
    static_cast<sarnschema::Error*>(chain.back().Get())->codeM = 3;
    if (i > 0) static_cast<sarnschema::Error*>(chain[i - 1].Get())->causeM = chain.back();
  }
  // Fields in number order: code, debug, text, retryInterval, cause, traceInfo ("type" before it).
  std::string json;
  for (int i = 1; i < kDepth; ++i) json += "{\"code\": \"badArgument\", \"text\": \"\", \"cause\": ";
  json += "{\"code\": \"badArgument\", \"text\": \"\", \"type\": \"error\"}";
  for (int i = 1; i < kDepth; ++i) json += ", \"type\": \"error\"}";
  const std::pair<std::function<bool(VekMempool*, std::string&)>, std::string> writers[] = {
      {[&](VekMempool* pool, std::string& text) {
         ByteBuffer out(&poolM);
         bool ok = JsonSarnObject(pool).SarnObjectToJson(chain.front().Get(), 0, out);
         text.assign(reinterpret_cast<const char*>(out.GetData()), out.GetLength());
         return ok;
       },
       json},
      {[&](VekMempool* pool, std::string& bytes) {
         ProtoBufByteOutputStream out;
         ProtoBuf(pool, Schema::vStructDefG, Schema::nStructDefG).MarshalKnownDict(chain.front().Get(), &out);
         bytes = sarntest::Finished(out);
         return !out.IsOutOfMemory();
       },
       objopstest::ErrorChainBytes(kDepth, 3)},
  };
  for (const auto& [write, expected] : writers) {
    std::string out;
    ASSERT_TRUE(write(&poolM, out));
    EXPECT_TRUE(out == expected) << (&expected == &writers[0].second ? "json" : "binary") << " wrote " << out.size() << " bytes";
    VekMempool failing("failing");
    failing.FailAllocationAfter(0);
    EXPECT_FALSE(write(&failing, out));
    EXPECT_EQ(failing.GetUsedBytes(), 0u);
  }
  // Released from the top so that no destructor recurses through the chain.
  for (auto& link : chain) link.Reset();
}

}  // namespace
